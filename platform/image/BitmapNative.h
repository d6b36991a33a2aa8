// Internal: what a Bitmap holds, for the platform layer's backends (never installed).
#pragma once

#include <leptonica/allheaders.h>

#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/platform/Image.h"

namespace corvel {

struct Bitmap::Native {
  // Owned; 1, 8 or 32 bits per pixel, never colour-mapped (decoding normalises).
  PIX* pix = nullptr;

  explicit Native(PIX* p) : pix(p) {}
  ~Native() {
    if (pix) pixDestroy(&pix);
  }
  Native(const Native&) = delete;
  Native& operator=(const Native&) = delete;
};

// Takes ownership of `pix` and normalises it to 1, 8 or 32 bits per pixel without a
// colour map; nullptr (and `pix` freed) when that fails or the size is out of budget.
std::shared_ptr<Bitmap> bitmapFromPix(PIX* pix, std::string* failure);

// Decodes a PNG file's bytes; nullptr with *failure saying why when they are not one
// whole PNG image within the pixel budget. With a `maxLongSide` the image is reduced
// to fit while it is decoded, where its layout allows (not interlaced); the result may
// then still be larger, and the caller reduces it with reducePix.
PIX* decodePNG(const std::uint8_t* bytes, std::size_t size, std::uint32_t maxLongSide,
               std::string* failure);

// Decodes a JPEG file's bytes (grey, RGB or CMYK) the same way, reduced while decoding;
// the full size goes to `fullWidth` and `fullHeight`. nullptr with *failure saying why
// (libjpeg's own words included) when they are not a whole JPEG within the budget.
PIX* decodeJPEG(const std::uint8_t* bytes, std::size_t size, std::uint32_t maxLongSide,
                std::uint32_t* fullWidth, std::uint32_t* fullHeight, std::string* failure);

// Leptonica and libtiff report problems on stderr by default. Once quietLeptonica() has
// run (any number of calls, from any thread), their messages on a thread where a
// Collecting lives go into its string instead (the first message only, which says the
// most); elsewhere they go where they went before.
void quietLeptonica();
class Collecting {
 public:
  explicit Collecting(std::string* into);
  ~Collecting();
  Collecting(const Collecting&) = delete;
  Collecting& operator=(const Collecting&) = delete;

 private:
  std::string* previous_;
};

// Asks the kernel for huge pages over the whole 2 MiB blocks of a fresh picture buffer
// before it is first written.
void adviseHugePages(void* buffer, std::size_t size);

// A picture with uninitialised pixels (pad bits cleared) whose buffer has huge pages
// from the start: Leptonica's own allocation writes every row's pad bits at once, so any
// advice given after it comes too late. The buffer comes from posix_memalign, which
// Leptonica's default deallocator (free) releases with the picture; this library never
// installs a Leptonica pix memory manager and assumes its host does not either.
PIX* createPagePix(std::uint32_t width, std::uint32_t height, int depth);

// The size a picture is reduced to so that its long side is at most `maxLongSide`;
// nullopt when it already fits (or nothing is asked).
struct ReducedSize {
  std::uint32_t width, height;
  double scale;
};
std::optional<ReducedSize> reducedSizeFor(std::uint32_t width, std::uint32_t height,
                                          std::uint32_t maxLongSide);

// Reduces rows given top to bottom into `out` (of the reduced size): every target pixel
// is the rounded mean of the block of whole source pixels that falls in it. Rows are in
// PNG's byte order: a byte per pixel for 1 channel, R, G, B, A for 4.
class RowReducer {
 public:
  RowReducer(std::uint32_t width, std::uint32_t height, ReducedSize size, int channels, PIX* out);
  void addRow(const std::uint8_t* row);

 private:
  void flush();

  std::uint32_t width_, height_;
  ReducedSize size_;
  int channels_;
  PIX* out_;
  std::vector<std::uint32_t> firstColumn_;  // of each target column, and the width at the end
  std::vector<double> columnReciprocal_;    // 1 / source columns of each target column
  std::vector<std::uint32_t> columnSums_;   // of the rows of the current target row
  bool atMostTwoColumns_ = true;            // in every target column
  std::vector<std::uint8_t> lineBytes_;     // a grey target row before packing
  std::uint32_t nextRow_ = 0, currentTarget_ = 0, rowsInTarget_ = 0;
};

// Builds a picture from rows given top to bottom in PNG's byte order (a byte per pixel
// for grey, R, G, B, A for colour): whole, or reduced to fit `maxLongSide` as it goes.
class PictureBuilder {
 public:
  // `channels` is 1 (grey, 8 bits) or 4 (32 bits; samples per pixel 4 with `alpha`, else
  // 3); the resolution is in dots per inch, 0 when unknown.
  PictureBuilder(std::uint32_t width, std::uint32_t height, int channels, bool alpha,
                 std::uint32_t maxLongSide, l_int32 xResolution, l_int32 yResolution);
  ~PictureBuilder();
  PictureBuilder(const PictureBuilder&) = delete;
  PictureBuilder& operator=(const PictureBuilder&) = delete;

  // False when there was no memory for the picture.
  bool ready() const { return pix_ != nullptr; }
  void addRow(const std::uint8_t* row);
  // The picture (once every row is in); the caller owns it.
  PIX* take();

 private:
  PIX* pix_ = nullptr;
  std::optional<RowReducer> reducer_;
  std::uint32_t width_, nextRow_ = 0;
  int channels_;
};

// The 32-bit big-endian number at `p`: four bytes in PNG order as one Leptonica word.
inline std::uint32_t bigEndian32(const std::uint8_t* p) {
  return (std::uint32_t{p[0]} << 24) | (std::uint32_t{p[1]} << 16) | (std::uint32_t{p[2]} << 8) |
         p[3];
}

// Writes `width` grey bytes in reading order into a Leptonica 8-bit row (first pixel in
// the high byte of each word).
void packGreyRow(l_uint32* line, const std::uint8_t* bytes, std::uint32_t width);

// Dots per inch from a PNG's pixels per metre.
l_int32 dotsPerInch(std::uint32_t perMetre);

// `pix` (1, 8 or 32 bits) reduced so that its long side is at most `maxLongSide`, in the
// same way as while decoding; nullptr when it already fits or cannot be reduced. Bilevel
// pictures become grey.
PIX* reducePix(PIX* pix, std::uint32_t maxLongSide);

}  // namespace corvel
