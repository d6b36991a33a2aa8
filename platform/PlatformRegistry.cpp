// The registry's own services: the log sink, the platform version and the caches
// directory. The other services keep their registry entries beside their defaults.
#include <iostream>
#include <mutex>

#include "Corvelbase/platform/Log.h"
#include "Corvelbase/platform/Platform.h"

namespace corvel {

namespace {

struct RegistryState {
  std::mutex mutex;
  PlatformRegistry::LogSink logSink;
  PlatformVersion version;
  std::optional<std::string> cachesDirectory;
};

RegistryState& state() {
  static RegistryState* s = new RegistryState;  // never destroyed: used until exit
  return *s;
}

}  // namespace

void PlatformRegistry::setLogSink(LogSink sink) {
  std::lock_guard lock(state().mutex);
  state().logSink = std::move(sink);
}

PlatformRegistry::LogSink PlatformRegistry::logSink() {
  std::lock_guard lock(state().mutex);
  return state().logSink;
}

void PlatformRegistry::setPlatformVersion(PlatformVersion version) {
  std::lock_guard lock(state().mutex);
  state().version = version;
}

PlatformVersion PlatformRegistry::platformVersion() {
  std::lock_guard lock(state().mutex);
  return state().version;
}

void PlatformRegistry::setCachesDirectory(std::optional<std::string> path) {
  std::lock_guard lock(state().mutex);
  state().cachesDirectory = std::move(path);
}

std::optional<std::string> PlatformRegistry::cachesDirectoryOverride() {
  std::lock_guard lock(state().mutex);
  return state().cachesDirectory;
}

void logMessage(std::string_view line) {
  if (auto sink = PlatformRegistry::logSink()) {
    sink(line);
    return;
  }
  static std::mutex stderrMutex;
  std::lock_guard lock(stderrMutex);
  std::cerr << line << '\n';
}

}  // namespace corvel
