// Helpers shared by the drawing and scaled-image tests.
#pragma once

#include <algorithm>
#include <filesystem>
#include <memory>
#include <optional>
#include <set>
#include <string>

#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/Pasteboard.h"
#include "Corvelbase/platform/Platform.h"
#include "support/TestSupport.h"

namespace corvel::testing {

// Points the caches directory at a fresh temporary folder for as long as it lives, so
// that no test writes into the user's real caches; restores the previous setting after.
class ScopedCachesDirectory {
 public:
  ScopedCachesDirectory() : previous_(PlatformRegistry::cachesDirectoryOverride()) {
    PlatformRegistry::setCachesDirectory(dir_.path());
  }
  ~ScopedCachesDirectory() { PlatformRegistry::setCachesDirectory(previous_); }
  ScopedCachesDirectory(const ScopedCachesDirectory&) = delete;
  ScopedCachesDirectory& operator=(const ScopedCachesDirectory&) = delete;

  const std::string& path() const { return dir_.path(); }
  std::string file(const std::string& name) const { return dir_.file(name); }
  // The names of the entries in the folder.
  std::set<std::string> names() const {
    std::set<std::string> result;
    for (const auto& entry : std::filesystem::directory_iterator(dir_.path()))
      result.insert(entry.path().filename().string());
    return result;
  }

 private:
  TempDir dir_;
  std::optional<std::string> previous_;
};

// A fresh process-local general pasteboard for as long as it lives.
class ScopedPasteboard {
 public:
  ScopedPasteboard() : pasteboard_(std::make_shared<MemoryPasteboard>()) {
    PlatformRegistry::setGeneralPasteboard(pasteboard_);
  }
  ~ScopedPasteboard() { PlatformRegistry::setGeneralPasteboard(nullptr); }
  ScopedPasteboard(const ScopedPasteboard&) = delete;
  ScopedPasteboard& operator=(const ScopedPasteboard&) = delete;

  MemoryPasteboard& operator*() const { return *pasteboard_; }
  MemoryPasteboard* operator->() const { return pasteboard_.get(); }

 private:
  std::shared_ptr<MemoryPasteboard> pasteboard_;
};

// A picture of `width` x `height` with a gradient, so its JPEG is not trivial.
inline std::shared_ptr<Image> makePicture(std::uint32_t width, std::uint32_t height) {
  Data rgba(std::size_t{width} * height * 4);
  for (std::uint32_t y = 0; y < height; ++y)
    for (std::uint32_t x = 0; x < width; ++x) {
      std::uint8_t* p = &rgba[(std::size_t{y} * width + x) * 4];
      p[0] = static_cast<std::uint8_t>(x * 255 / std::max(width, 1u));
      p[1] = static_cast<std::uint8_t>(y * 255 / std::max(height, 1u));
      p[2] = static_cast<std::uint8_t>((x + y) & 0xFF);
      p[3] = 255;
    }
  return Image::initWithBitmap(Bitmap::fromRGBA(width, height, rgba.data(), rgba.size()));
}

// Stroke bytes as a drawing program might write them: every byte value, zeros included.
inline Data makeStrokes(std::size_t size, std::uint8_t seed) {
  Data bytes(size);
  std::uint32_t state = seed * 2654435761u + 1;
  for (auto& b : bytes) {
    state = state * 1103515245u + 12345u;
    b = static_cast<std::uint8_t>(state >> 16);
  }
  return bytes;
}

// True for the canonical upper-case text of a UUID.
inline bool isUpperCaseUUID(const std::string& text) {
  if (text.size() != 36) return false;
  for (std::size_t i = 0; i < text.size(); ++i) {
    bool dash = i == 8 || i == 13 || i == 18 || i == 23;
    char c = text[i];
    if (dash ? c != '-' : !((c >= '0' && c <= '9') || (c >= 'A' && c <= 'F'))) return false;
  }
  return true;
}

}  // namespace corvel::testing
