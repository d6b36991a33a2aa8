// bench_ocr: our OCR batch through the shared queue against the `tesseract` command run
// the best way it can be (two processes at a time, OMP_THREAD_LIMIT=1, the same
// language), on the same images in the same run.
//
// Sets: the full pages tests/fixtures/ocr/pages/page-*.png (A4 at 300 dpi, one and two
// columns) and the single lines tests/fixtures/ocr/lines/line-*.png cut from them.
// For each set and level (accurate, fast) it prints images per minute of ours and of
// the command and their ratio, the character error rate of both against the pages'
// source, and the share of our process's CPU time spent outside the engine's
// recognition (reading and decoding files, reducing and turning pages, reading the
// engine's results, layout analysis, text, queueing; engine start-up is shown apart). At the end:
// peak memory of our process and of the largest command.
//
// Usage: bench_ocr [--pages N] [--lines N] [--fast-cap PIXELS]
//   (defaults: all pages, all lines, the recogniser's own cap for the fast level)
// The command runs once next to each of our levels, just before it.
// The command must be on PATH (Debian's tesseract-ocr); without it only ours is timed.
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fcntl.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"
#include "bench/TesseractCommand.h"
#include "platform/tesseract/TesseractStatistics.h"
#include "support/TextDistance.h"

namespace {

using namespace corvel;
namespace fs = std::filesystem;

constexpr int kCommandProcesses = 2;

struct Sample {
  std::string image;
  std::string expected;  // source text, for the error rate
};

std::string readText(const fs::path& path) { return bench::readWhole(path.string()); }

std::vector<Sample> pages(std::size_t limit) {
  std::vector<Sample> out;
  fs::path dir = fs::path(CORVEL_FIXTURES_DIR) / "ocr" / "pages";
  for (std::size_t i = 1; out.size() < limit; ++i) {
    char name[32];
    std::snprintf(name, sizeof name, "page-%02zu", i);
    if (!fs::exists(dir / (std::string(name) + ".png"))) break;
    out.push_back({(dir / (std::string(name) + ".png")).string(),
                   readText(dir / (std::string(name) + ".txt"))});
  }
  return out;
}

std::vector<Sample> lines(std::size_t limit) {
  std::vector<Sample> out;
  fs::path dir = fs::path(CORVEL_FIXTURES_DIR) / "ocr" / "lines";
  std::ifstream texts(dir / "lines.txt");
  std::string text;
  for (std::size_t i = 1; out.size() < limit && std::getline(texts, text); ++i) {
    char name[32];
    std::snprintf(name, sizeof name, "line-%03zu.png", i);
    out.push_back({(dir / name).string(), text});
  }
  return out;
}

// Edit distance after normalising white space, over all texts, divided by the expected
// length.
double errorRate(const std::vector<std::string>& expected, const std::vector<std::string>& got) {
  double errors = 0, length = 0;
  for (std::size_t k = 0; k < expected.size(); ++k) {
    std::u32string a = corvel::testing::normalised(expected[k]);
    std::u32string b = corvel::testing::normalised(k < got.size() ? got[k] : "");
    errors += static_cast<double>(corvel::testing::editDistance(a, b));
    length += static_cast<double>(a.size());
  }
  return length > 0 ? errors / length : 0;
}

double processCpuSeconds() {
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  auto seconds = [](const timeval& t) { return t.tv_sec + t.tv_usec * 1e-6; };
  return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

double since(std::chrono::steady_clock::time_point start) {
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

struct Run {
  double seconds = 0;
  std::vector<std::string> texts;
  int failures = 0;
  double ownShare = -1;       // of process CPU outside recognition, start-up excluded
  double startupSeconds = 0;  // engine start-up within this run
};

// Our batch: every image queued at once, completions drained on this thread.
Run runOurs(const std::vector<Sample>& samples, bool fast, TesseractRecognizer& recognizer) {
  Run run;
  run.texts.resize(samples.size());
  std::vector<char> done(samples.size(), 0);
  auto before = detail::tesseractStatistics(recognizer);
  double cpuBefore = processCpuSeconds();
  auto start = std::chrono::steady_clock::now();
  for (std::size_t i = 0; i < samples.size(); ++i) {
    RVVisionOCR::ocrImageAtPath(fromUTF8(samples[i].image), {"en-US"}, fast,
                                [&, i](const String& text, const std::optional<Error>& error) {
                                  run.texts[i] = toUTF8(text);
                                  if (error) ++run.failures;
                                  done[i] = 1;
                                });
  }
  MainQueue::runUntil(
      [&] { return std::all_of(done.begin(), done.end(), [](char d) { return d; }); });
  run.seconds = since(start);
  double cpu = processCpuSeconds() - cpuBefore;
  auto after = detail::tesseractStatistics(recognizer);
  double engine = after.recognitionCpuSeconds - before.recognitionCpuSeconds;
  run.startupSeconds = after.engineStartCpuSeconds - before.engineStartCpuSeconds;
  double ours = cpu - engine - run.startupSeconds;
  run.ownShare = cpu > 0 ? std::max(0.0, ours) / (cpu - run.startupSeconds) : 0;
  return run;
}

// The command on every image, kCommandProcesses at a time, each reading its image and
// writing its text to a file.
Run runCommand(const std::vector<Sample>& samples, const fs::path& work) {
  std::vector<bench::CommandItem> items;
  for (std::size_t i = 0; i < samples.size(); ++i) {
    items.push_back({samples[i].image, "eng", (work / ("out-" + std::to_string(i))).string()});
  }
  Run run;
  for (const auto& result : bench::runTesseractBatch(items, kCommandProcesses, &run.seconds)) {
    run.texts.push_back(result.text);
    if (result.failed) ++run.failures;
  }
  return run;
}

// Peak resident memory of one command on `sample`, in MiB. Measured before this process
// has grown: a spawned child's peak starts from its parent's at the time of spawning.
double commandPeakMiB(const Sample& sample, const fs::path& work) {
  pid_t pid = 0;
  double peak = -1;
  if (bench::spawnTesseract(sample.image, (work / "peak").string(), "eng", environ, &pid)) {
    int status = 0;
    rusage usage{};
    if (wait4(pid, &status, 0, &usage) == pid) peak = usage.ru_maxrss / 1024.0;
  }
  return peak;
}

void report(const char* set, const char* level, const std::vector<Sample>& samples, const Run& ours,
            const Run* command) {
  std::vector<std::string> expected;
  for (const auto& s : samples) expected.push_back(s.expected);
  double perMinute = 60.0 * static_cast<double>(samples.size()) / ours.seconds;
  std::printf(
      "%-6s %-8s ours %7.1f/min  error %5.2f%%  own CPU share %5.2f%% (engine start %.2f s CPU)",
      set, level, perMinute, 100 * errorRate(expected, ours.texts), 100 * ours.ownShare,
      ours.startupSeconds);
  if (command) {
    double commandPerMinute = 60.0 * static_cast<double>(samples.size()) / command->seconds;
    std::printf(" | command %7.1f/min  error %5.2f%% | ratio %.2fx", commandPerMinute,
                100 * errorRate(expected, command->texts), perMinute / commandPerMinute);
  }
  if (ours.failures || (command && command->failures)) {
    std::printf("  [failures: ours %d, command %d]", ours.failures,
                command ? command->failures : 0);
  }
  std::printf("\n");
  std::fflush(stdout);
}

}  // namespace

int main(int argc, char** argv) {
  std::size_t pageLimit = 1000, lineLimit = 1000;
  TesseractRecognizer::Options options;
  for (int i = 1; i + 1 < argc; i += 2) {
    std::string flag = argv[i];
    std::size_t value = std::strtoul(argv[i + 1], nullptr, 10);
    if (flag == "--pages") pageLimit = value;
    if (flag == "--lines") lineLimit = value;
    if (flag == "--fast-cap") options.fastMaxLongSide = static_cast<std::uint32_t>(value);
  }
  auto recognizer = TesseractRecognizer::init(options);
  if (!recognizer->isAvailable()) {
    std::fprintf(stderr, "bench_ocr: no Tesseract language data installed\n");
    return 1;
  }
  PlatformRegistry::setTextRecognizer(recognizer);
  RVVisionOCR::ocrQueue();  // made on the main thread, as hosts do

  bool command = bench::tesseractAvailable();
  fs::path work = fs::temp_directory_path() / ("bench_ocr." + std::to_string(getpid()));
  fs::create_directories(work);
  std::printf("bench_ocr: %u cores; command: %s\n", std::thread::hardware_concurrency(),
              command ? "tesseract, 2 processes, OMP_THREAD_LIMIT=1, -l eng" : "not found");

  struct Set {
    const char* name;
    std::vector<Sample> samples;
  } sets[] = {{"pages", pages(pageLimit)}, {"lines", lines(lineLimit)}};
  double commandPeak =
      command && !sets[0].samples.empty() ? commandPeakMiB(sets[0].samples[0], work) : -1;
  double accurateSeconds = 0, fastSeconds = 0;
  for (const auto& set : sets) {
    if (set.samples.empty()) continue;
    std::printf("%s: %zu images\n", set.name, set.samples.size());
    for (bool fast : {false, true}) {
      // The command has one speed; it runs again next to each of our levels, so both
      // sides of a ratio see the same load on the machine.
      Run reference;
      if (command) reference = runCommand(set.samples, work);
      Run ours = runOurs(set.samples, fast, *recognizer);
      report(set.name, fast ? "fast" : "accurate", set.samples, ours,
             command ? &reference : nullptr);
      if (std::string(set.name) == "pages") (fast ? fastSeconds : accurateSeconds) = ours.seconds;
    }
  }
  if (fastSeconds > 0)
    std::printf("pages: fast is %.2fx the speed of accurate\n", accurateSeconds / fastSeconds);

  rusage self{};
  getrusage(RUSAGE_SELF, &self);
  std::printf(
      "peak memory: ours %.0f MiB (the whole process, engines for 2 recognitions at once"
      " and up to 6 jobs' pages); one command %.0f MiB (on the first page)\n",
      self.ru_maxrss / 1024.0, commandPeak);
  fs::remove_all(work);
  return 0;
}
