// Bitmaps and images: PNG decoded with libpng, JPEG with libjpeg, TIFF
// (first page), BMP, GIF, WebP and PNM with Leptonica. Decoding writes nothing to
// standard error: what the libraries say about a damaged picture becomes its
// failureReason().
//
// A `Bitmap` is decoded pixels: immutable once made and shared by reference, so it may
// be read from any thread. An `Image` is a picture as the application hands it around: it
// may reference a file or a `file:` URL and decode only when its pixels are first asked
// for, or be made from encoded data or from a bitmap. Decoding is done once, under a
// lock, so an image may be shared between threads.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

class CORVEL_EXPORT Bitmap {
 public:
  // Opaque handle to the decoded pixels for the platform layer's backends
  // (platform/image/BitmapNative.h).
  struct Native;

  // A bitmap of 8-bit RGBA pixels, rows top to bottom without padding. nullptr for a zero
  // size, a size beyond the pixel budget, or fewer bytes than width * height * 4.
  static std::shared_ptr<Bitmap> fromRGBA(std::uint32_t width, std::uint32_t height,
                                          const std::uint8_t* rgba, std::size_t size);
  // A bitmap of 8-bit pixels with 1 (grey), 3 (RGB) or 4 (RGBA) channels, rows top to
  // bottom `bytesPerRow` apart: a row may be followed by padding, as in a view of part of
  // a larger picture or an array with aligned rows. `size` is the bytes readable from
  // `pixels`. The pixels are read once, straight into the bitmap (grey stays one byte a
  // pixel). nullptr for another channel count, a zero size, a size beyond the pixel
  // budget, a row stride shorter than a row, or fewer bytes than the rows need.
  static std::shared_ptr<Bitmap> fromPixels(std::uint32_t width, std::uint32_t height, int channels,
                                            const std::uint8_t* pixels, std::size_t bytesPerRow,
                                            std::size_t size);

  explicit Bitmap(std::unique_ptr<Native> native);
  ~Bitmap();
  Bitmap(const Bitmap&) = delete;
  Bitmap& operator=(const Bitmap&) = delete;

  std::uint32_t width() const;
  std::uint32_t height() const;
  // The pixels as 8-bit RGBA, rows top to bottom (a copy; greyscale expands to grey RGB,
  // alpha is 255 where the source has none).
  Data rgba() const;
  const Native& native() const { return *native_; }

 private:
  std::unique_ptr<Native> native_;
};

// Images larger than this many pixels are refused instead of exhausting memory.
inline constexpr std::uint64_t kMaxImagePixels = 400'000'000;

class CORVEL_EXPORT Image {
 public:
  // An image that reads the file when its bitmap is first asked for. Always an object:
  // a missing or undecodable file shows up as a null bitmap() with a failureReason().
  static std::shared_ptr<Image> initByReferencingFile(const std::string& path);
  // The same for a URL; only `file:` URLs ("file:///p", "file://localhost/p", "file:/p",
  // percent-escapes decoded) can be read, any other scheme fails on decoding.
  static std::shared_ptr<Image> initByReferencingURL(const std::string& url);
  // An image decoded now from encoded bytes; nullptr when they are no decodable image.
  static std::shared_ptr<Image> initWithData(const Data& data);
  // An image holding `bitmap`; nullptr for a null bitmap.
  static std::shared_ptr<Image> initWithBitmap(std::shared_ptr<Bitmap> bitmap);

  Image(const Image&) = delete;
  Image& operator=(const Image&) = delete;
  ~Image();

  // The decoded pixels (decoding on the first call), or nullptr when the image cannot be
  // decoded; failureReason() then says why.
  std::shared_ptr<Bitmap> bitmap() const;
  // The pixels reduced so that the long side is at most `maxLongSide` (by area means, the
  // resolution reduced alike), for a reader that needs no more; the full bitmap when it
  // fits or `maxLongSide` is 0. An image that references a file and has not been decoded
  // yet is reduced while it is decoded (a JPEG, or a PNG that is not interlaced, a row at
  // a time, without holding the full-size pixels), and nothing is kept. nullptr when the image
  // cannot be decoded.
  std::shared_ptr<Bitmap> bitmapFittingLongSide(std::uint32_t maxLongSide) const;
  // Empty while decoding has not failed.
  std::string failureReason() const;
  // Pixel size; the zero size when the image cannot be decoded.
  Size size() const;
  // The image's representations: its one decoded bitmap, or none when it cannot be
  // decoded.
  std::vector<std::shared_ptr<Bitmap>> representations() const;

  // JPEG file bytes of the representations at a compression factor in 0...1 (1 is the
  // best quality; values outside are clamped), transparent pixels composed over white.
  // nullopt when there is nothing that can be written.
  std::optional<Data> jpegData(double compressionFactor) const;

 private:
  Image() = default;
  void decode() const;

  std::string path_;         // file to decode lazily, when not empty
  std::string sourceError_;  // a failure known before decoding (an unsupported URL)
  mutable std::once_flag decodeOnce_;
  mutable std::atomic<bool> decoded_{false};
  mutable std::mutex knownSizeMutex_;
  mutable std::optional<Size> knownSize_;  // from a reduced decoding
  mutable std::shared_ptr<Bitmap> bitmap_;
  mutable std::string failure_;
};

// JPEG bytes of a bitmap at a compression factor in 0...1; nullopt on failure.
CORVEL_EXPORT std::optional<Data> jpegDataForBitmap(const Bitmap& bitmap, double compressionFactor);
// PNG bytes of a bitmap (lossless, alpha kept); nullopt on failure.
CORVEL_EXPORT std::optional<Data> pngDataForBitmap(const Bitmap& bitmap);

}  // namespace corvel
