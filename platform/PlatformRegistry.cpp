// The registry: every service's installed value lives here. Defaults come from the parts
// of the platform layer that implement them (platform/Backends.h).
#include <iostream>
#include <mutex>

#include "Corvelbase/platform/Log.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Pasteboard.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"
#include "platform/Backends.h"

namespace corvel {

namespace {

struct RegistryState {
  std::mutex mutex;
  PlatformRegistry::LogSink logSink;
  PlatformVersion version;
  std::optional<std::string> cachesDirectory;
  // Installed by a host or a test; null means the default.
  std::shared_ptr<TextRecognizer> recognizer;
  std::shared_ptr<MainQueueDispatcher> dispatcher;
  std::shared_ptr<Pasteboard> pasteboard;
  std::shared_ptr<Pasteboard> processLocalPasteboard = std::make_shared<MemoryPasteboard>();
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

void PlatformRegistry::setTextRecognizer(std::shared_ptr<TextRecognizer> recognizer) {
  std::lock_guard lock(state().mutex);
  state().recognizer = std::move(recognizer);
}

std::shared_ptr<TextRecognizer> PlatformRegistry::textRecognizer() {
  {
    std::lock_guard lock(state().mutex);
    if (state().recognizer) return state().recognizer;
  }
  // Made on first use, outside the registry's lock: starting the engine may log. Never
  // destroyed, since work on other threads may still hold it at exit.
  static const auto* standard =
      new std::shared_ptr<TextRecognizer>(detail::makeDefaultTextRecognizer());
  return *standard;
}

void PlatformRegistry::setMainQueueDispatcher(std::shared_ptr<MainQueueDispatcher> dispatcher) {
  std::lock_guard lock(state().mutex);
  state().dispatcher = std::move(dispatcher);
}

std::shared_ptr<MainQueueDispatcher> PlatformRegistry::mainQueueDispatcher() {
  {
    std::lock_guard lock(state().mutex);
    if (state().dispatcher) return state().dispatcher;
  }
  return detail::internalMainQueueDispatcher();
}

void PlatformRegistry::setGeneralPasteboard(std::shared_ptr<Pasteboard> pasteboard) {
  std::lock_guard lock(state().mutex);
  state().pasteboard = std::move(pasteboard);
}

std::shared_ptr<Pasteboard> PlatformRegistry::generalPasteboard() {
  std::lock_guard lock(state().mutex);
  return state().pasteboard ? state().pasteboard : state().processLocalPasteboard;
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
