// The process-wide registry of the services that stand in for the desktop platform.
//
// Each service has a working default; a host installs its own at start-up (its
// toolkit's clipboard or main loop, another OCR engine), and a test installs a fake.
// Installing is safe from any thread, but the library reads a service when it needs
// it, so swap services while no work that uses them is in flight.
#pragma once

#include <functional>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "Corvelbase/Export.h"

namespace corvel {

class TextRecognizer;       // Corvelbase/platform/TextRecognizer.h
class MainQueueDispatcher;  // Corvelbase/platform/OperationQueue.h
class Pasteboard;           // Corvelbase/platform/Pasteboard.h

// The version of the desktop platform whose behaviour the library reproduces. Code paths
// that differ by platform release ask `isAtLeast`; the default is the newest release,
// where everything is available.
struct PlatformVersion {
  int major = std::numeric_limits<int>::max();
  int minor = 0;
  int patch = 0;

  constexpr bool isAtLeast(int wantMajor, int wantMinor = 0, int wantPatch = 0) const {
    if (major != wantMajor) return major > wantMajor;
    if (minor != wantMinor) return minor > wantMinor;
    return patch >= wantPatch;
  }
};

class CORVEL_EXPORT PlatformRegistry {
 public:
  using LogSink = std::function<void(std::string_view line)>;

  // Diagnostics: nullptr restores the default (standard error).
  static void setLogSink(LogSink sink);
  static LogSink logSink();

  static void setPlatformVersion(PlatformVersion version);
  static PlatformVersion platformVersion();

  // Where attachments keep their files. nullopt restores the default: $XDG_CACHE_HOME
  // when set, non-empty and absolute, else $HOME/.cache.
  static void setCachesDirectory(std::optional<std::string> path);
  static std::optional<std::string> cachesDirectoryOverride();

  // The text recogniser in use; the default is the Tesseract engine.
  static void setTextRecognizer(std::shared_ptr<TextRecognizer> recognizer);
  static std::shared_ptr<TextRecognizer> textRecognizer();

  // Where work for the main thread goes; the default is an internal queue that the host
  // drains (MainQueue::drain).
  static void setMainQueueDispatcher(std::shared_ptr<MainQueueDispatcher> dispatcher);
  static std::shared_ptr<MainQueueDispatcher> mainQueueDispatcher();

  // The general pasteboard; the default lives in this process only.
  static void setGeneralPasteboard(std::shared_ptr<Pasteboard> pasteboard);
  static std::shared_ptr<Pasteboard> generalPasteboard();
};

}  // namespace corvel
