// The `tesseract` command as the benchmarks run it: the best way it can be run on a
// batch, several processes at a time, each with OMP_THREAD_LIMIT=1.
#pragma once

#include <fcntl.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <map>
#include <sstream>
#include <string>
#include <vector>

extern char** environ;

namespace corvel::bench {

inline bool tesseractAvailable() {
  return std::system("command -v tesseract >/dev/null 2>&1") == 0;
}

inline std::string readWhole(const std::string& path) {
  std::ifstream in(path);
  std::stringstream text;
  text << in.rdbuf();
  return text.str();
}

// The environment with OMP_THREAD_LIMIT=1: the command's OpenMP threads only compete
// with the other processes of the batch.
class SingleThreadEnvironment {
 public:
  SingleThreadEnvironment() {
    for (char** e = environ; *e; ++e) {
      if (std::string(*e).rfind("OMP_THREAD_LIMIT=", 0) != 0) values_.emplace_back(*e);
    }
    values_.emplace_back("OMP_THREAD_LIMIT=1");
    for (auto& value : values_) pointers_.push_back(value.data());
    pointers_.push_back(nullptr);
  }
  char** get() { return pointers_.data(); }

 private:
  std::vector<std::string> values_;
  std::vector<char*> pointers_;
};

// Starts `tesseract IMAGE OUT_BASE -l MODEL` with its output silenced; false when it
// cannot start.
inline bool spawnTesseract(const std::string& image, const std::string& outBase,
                           const std::string& model, char** envp, pid_t* pid) {
  std::vector<std::string> args{"tesseract", image, outBase, "-l", model};
  std::vector<char*> argv;
  for (auto& a : args) argv.push_back(a.data());
  argv.push_back(nullptr);
  posix_spawn_file_actions_t quiet;
  posix_spawn_file_actions_init(&quiet);
  posix_spawn_file_actions_addopen(&quiet, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  posix_spawn_file_actions_addopen(&quiet, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  bool started = posix_spawnp(pid, "tesseract", &quiet, nullptr, argv.data(), envp) == 0;
  posix_spawn_file_actions_destroy(&quiet);
  return started;
}

struct CommandItem {
  std::string image;
  std::string model;    // "eng", "deu", ...
  std::string outBase;  // the text goes to OUT_BASE.txt
};

struct CommandResult {
  std::string text;
  double seconds = 0;  // the process's own wall time
  bool failed = false;
};

// Runs the command on every item, `processes` at a time; returns each item's result
// and sets *batchSeconds to the wall time of the whole batch.
inline std::vector<CommandResult> runTesseractBatch(const std::vector<CommandItem>& items,
                                                    int processes, double* batchSeconds) {
  using Clock = std::chrono::steady_clock;
  SingleThreadEnvironment environment;
  std::vector<CommandResult> results(items.size());
  std::map<pid_t, std::pair<std::size_t, Clock::time_point>> running;
  auto start = Clock::now();
  std::size_t next = 0;
  while (next < items.size() || !running.empty()) {
    while (static_cast<int>(running.size()) < processes && next < items.size()) {
      pid_t pid = 0;
      if (spawnTesseract(items[next].image, items[next].outBase, items[next].model,
                         environment.get(), &pid)) {
        running[pid] = {next, Clock::now()};
      } else {
        results[next].failed = true;
      }
      ++next;
    }
    int status = 0;
    pid_t done = running.empty() ? -1 : wait(&status);
    if (done <= 0) continue;
    auto it = running.find(done);
    if (it == running.end()) continue;
    auto& result = results[it->second.first];
    result.seconds = std::chrono::duration<double>(Clock::now() - it->second.second).count();
    result.failed = !WIFEXITED(status) || WEXITSTATUS(status) != 0;
    running.erase(it);
  }
  *batchSeconds = std::chrono::duration<double>(Clock::now() - start).count();
  for (std::size_t i = 0; i < items.size(); ++i) {
    results[i].text = readWhole(items[i].outBase + ".txt");
  }
  return results;
}

}  // namespace corvel::bench
