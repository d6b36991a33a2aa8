// Small helpers shared by the test suites.
#pragma once

#include <mutex>
#include <string>
#include <vector>

#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/String.h"

namespace corvel::testing {

// Captures the library's log lines for as long as it lives.
class LogCapture {
 public:
  LogCapture();
  ~LogCapture() { PlatformRegistry::setLogSink(nullptr); }
  LogCapture(const LogCapture&) = delete;
  LogCapture& operator=(const LogCapture&) = delete;

  std::vector<std::string> lines() const {
    std::lock_guard lock(mutex_);
    return lines_;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<std::string> lines_;
};

// A fresh empty directory under the build's test work folder, removed on destruction.
class TempDir {
 public:
  TempDir();
  ~TempDir();
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  const std::string& path() const { return path_; }
  std::string file(const std::string& name) const { return path_ + "/" + name; }

 private:
  std::string path_;
};

// Path of a committed fixture: tests/fixtures/<relative>.
inline std::string fixturePath(const std::string& relative) {
  return std::string(CORVEL_FIXTURES_DIR) + "/" + relative;
}
// The bytes of a file, or of a fixture, as a string; empty when it cannot be read.
std::string fileText(const std::string& path);
inline std::string fixtureText(const std::string& relative) {
  return fileText(fixturePath(relative));
}

// Runs a shell command, returning its exit status and standard output.
struct CommandResult {
  int status = -1;
  std::string output;
};
CommandResult runCommand(const std::string& command);
// Runs the command-line program with `arguments` (which may redirect its streams).
inline CommandResult corvel(const std::string& arguments) {
  return runCommand(std::string(CORVEL_TOOL_PATH) + " " + arguments);
}

}  // namespace corvel::testing
