// Helpers shared by the drawing and scaled-image tests.
#pragma once

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

// The names of the entries of `directory`.
inline std::set<std::string> namesIn(const std::string& directory) {
  std::set<std::string> result;
  for (const auto& entry : std::filesystem::directory_iterator(directory))
    result.insert(entry.path().filename().string());
  return result;
}

// Points the caches directory at a fresh temporary folder while it lives, so no test
// writes into the user's real caches; restores the previous setting after.
class ScopedCachesDirectory : public TempDir {
 public:
  ScopedCachesDirectory() { PlatformRegistry::setCachesDirectory(path()); }
  ~ScopedCachesDirectory() { PlatformRegistry::setCachesDirectory(previous_); }
  std::set<std::string> names() const { return namesIn(path()); }

 private:
  std::optional<std::string> previous_ = PlatformRegistry::cachesDirectoryOverride();
};

// A fresh process-local general pasteboard while it lives.
class ScopedPasteboard {
 public:
  ScopedPasteboard() { PlatformRegistry::setGeneralPasteboard(pasteboard_); }
  ~ScopedPasteboard() { PlatformRegistry::setGeneralPasteboard(nullptr); }
  MemoryPasteboard* operator->() const { return pasteboard_.get(); }

 private:
  std::shared_ptr<MemoryPasteboard> pasteboard_ = std::make_shared<MemoryPasteboard>();
};

// A picture with a gradient, so that its JPEG is not trivial.
inline std::shared_ptr<Image> makePicture(std::uint32_t width, std::uint32_t height) {
  Data rgba(std::size_t{width} * height * 4, 255);
  for (std::size_t i = 0; i + 3 < rgba.size(); i += 4) {
    rgba[i] = static_cast<std::uint8_t>(i / 4 % width * 7);
    rgba[i + 1] = static_cast<std::uint8_t>(i / 4 / width * 5);
  }
  return Image::initWithBitmap(Bitmap::fromRGBA(width, height, rgba.data(), rgba.size()));
}

// Stroke bytes as a drawing program might write them: every byte value, zeros included.
inline Data makeStrokes(std::size_t size, std::uint32_t seed) {
  Data bytes(size);
  for (auto& b : bytes) b = static_cast<std::uint8_t>((seed = seed * 1103515245u + 12345u) >> 16);
  return bytes;
}

// A one-byte file wrapper with the given names, as a loaded text holds them.
inline std::shared_ptr<FileWrapper> wrapperNamed(std::optional<std::string> filename,
                                                 std::optional<std::string> preferred = {}) {
  auto wrapper = FileWrapper::initRegularFileWithContents(Data{1});
  wrapper->setFilename(std::move(filename));
  wrapper->setPreferredFilename(std::move(preferred));
  return wrapper;
}

// The size of the picture in `bytes`; the zero size when there is none.
inline Size decodedSize(const std::optional<Data>& bytes) {
  auto image = bytes ? Image::initWithData(*bytes) : nullptr;
  return image ? image->size() : Size{};
}

}  // namespace corvel::testing
