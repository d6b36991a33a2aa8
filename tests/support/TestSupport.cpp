#include "support/TestSupport.h"

#include <sys/wait.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"

namespace corvel::testing {

LogCapture::LogCapture() {
  PlatformRegistry::setLogSink([this](std::string_view line) {
    std::lock_guard lock(mutex_);
    lines_.emplace_back(line);
  });
}

TempDir::TempDir() {
  std::filesystem::create_directories(CORVEL_TEST_WORK_DIR);
  std::string pattern = std::string(CORVEL_TEST_WORK_DIR) + "/tmp.XXXXXX";
  if (!mkdtemp(pattern.data())) std::abort();
  path_ = pattern;
}

TempDir::~TempDir() {
  std::error_code ec;
  std::filesystem::remove_all(path_, ec);
}

std::string fileText(const std::string& path) {
  auto bytes = readFile(path);
  return bytes ? std::string(bytes->begin(), bytes->end()) : std::string();
}

CommandResult runCommand(const std::string& command) {
  CommandResult result;
  FILE* pipe = popen(command.c_str(), "r");
  if (!pipe) return result;
  char buffer[4096];
  std::size_t n;
  while ((n = fread(buffer, 1, sizeof buffer, pipe)) > 0) result.output.append(buffer, n);
  int status = pclose(pipe);
  result.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  return result;
}

}  // namespace corvel::testing

// Fontconfig's configuration, loaded once when Poppler first looks up a font that a PDF
// does not embed (the text of a typed page), is kept for the life of the process; the
// leak checker of the sanitizer builds is told so.
extern "C" const char* __lsan_default_suppressions() { return "leak:libfontconfig.so\n"; }
