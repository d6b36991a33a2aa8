// PNG reading and writing. Reading goes to libpng directly rather than through
// Leptonica's reader, which decodes a whole page into libpng's row buffers and then
// copies it pixel by pixel into the bitmap: on a scanned page that is twice the time
// and twice the fresh memory. Rows here are decoded straight into the bitmap's own
// buffer, and libpng's messages become failure reasons instead of lines on stderr.
#include <png.h>

#include <csetjmp>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <vector>

#include "platform/image/BitmapNative.h"

namespace corvel {

namespace {

// What the two decoding phases share. Plain data only: libpng's errors longjmp out of
// the phases, past anything they hold.
struct Reader {
  const std::uint8_t* bytes;
  std::size_t size;
  std::size_t offset;
  char message[160];  // libpng's reason when it gives up
  // Found by readHeader.
  png_uint_32 width, height;
  int depth;   // of the decoded picture: 1, 8 or 32
  bool alpha;  // 32 bits: R, G, B, A rather than R, G, B and filler
  int passes;  // 1, or 7 for an interlaced image
  l_int32 xResolution, yResolution;
  // Filled by readRows: either the bilevel `pix` directly, or `builder` from `row`.
  PIX* pix;
  PictureBuilder* builder;
  png_bytep row;
  png_bytep* rows;  // row pointers for interlaced images
  png_bytep image;  // every row of an interlaced image for the builder
};

void readBytes(png_structp png, png_bytep out, png_size_t length) {
  auto* reader = static_cast<Reader*>(png_get_io_ptr(png));
  if (length > reader->size - reader->offset) png_error(png, "the data ends early");
  std::memcpy(out, reader->bytes + reader->offset, length);
  reader->offset += length;
}

[[noreturn]] void fail(png_structp png, png_const_charp message) {
  auto* reader = static_cast<Reader*>(png_get_error_ptr(png));
  std::snprintf(reader->message, sizeof reader->message, "%s", message ? message : "");
  png_longjmp(png, 1);
}

void ignoreWarning(png_structp, png_const_charp) {}

// Reads the header and sets up libpng to deliver rows of 1 bit for black-and-white
// images (kept at 1 bit unless they are to be reduced), a byte per pixel for grey, 4
// bytes otherwise. False with reader->message on failure.
bool readHeader(png_structp png, png_infop info, bool reduce, std::uint32_t maxLongSide,
                Reader* reader) {
  if (setjmp(png_jmpbuf(png))) return false;
  png_set_read_fn(png, reader, readBytes);
  // Chunk CRCs still catch damaged data; the Adler-32 sum over the inflated pixels
  // repeats that check at a tenth of the decoding time.
  png_set_option(png, PNG_IGNORE_ADLER32, PNG_OPTION_ON);
  png_read_info(png, info);
  reader->width = png_get_image_width(png, info);
  reader->height = png_get_image_height(png, info);
  if (reader->width == 0 || reader->height == 0 ||
      static_cast<std::uint64_t>(reader->width) * reader->height > kMaxImagePixels) {
    png_error(png, "the image's size is out of range");
  }
  int colorType = png_get_color_type(png, info);
  int bitDepth = png_get_bit_depth(png, info);
  bool transparency = png_get_valid(png, info, PNG_INFO_tRNS) != 0;
  reduce = reduce && reducedSizeFor(reader->width, reader->height, maxLongSide);
  bool bilevel = !reduce && colorType == PNG_COLOR_TYPE_GRAY && bitDepth == 1 && !transparency;
  if (bitDepth == 16) png_set_strip_16(png);  // the high byte, as Leptonica keeps it
  if (colorType == PNG_COLOR_TYPE_PALETTE) png_set_palette_to_rgb(png);
  if (colorType == PNG_COLOR_TYPE_GRAY && bitDepth < 8 && !bilevel) {
    png_set_expand_gray_1_2_4_to_8(png);
  }
  if (transparency) png_set_tRNS_to_alpha(png);
  bool grey = colorType == PNG_COLOR_TYPE_GRAY && !transparency;
  reader->alpha = (colorType & PNG_COLOR_MASK_ALPHA) != 0 || transparency;
  if (!grey && (colorType & PNG_COLOR_MASK_COLOR) == 0) png_set_gray_to_rgb(png);
  if (!grey && !reader->alpha) png_set_filler(png, 0xff, PNG_FILLER_AFTER);
  reader->passes = png_set_interlace_handling(png);
  png_read_update_info(png, info);
  reader->depth = bilevel ? 1 : grey ? 8 : 32;
  png_uint_32 xPerMetre = 0, yPerMetre = 0;
  int unit = 0;
  if (png_get_pHYs(png, info, &xPerMetre, &yPerMetre, &unit) && unit == PNG_RESOLUTION_METER) {
    reader->xResolution = dotsPerInch(xPerMetre);
    reader->yResolution = dotsPerInch(yPerMetre);
  }
  return true;
}

// Decodes every row into reader->pix or through reader->builder. Whatever follows the
// pixels (text, time, the end marker) is not needed: the image data's checksums have
// been compared by the time the last row is out. False with reader->message on failure.
bool readRows(png_structp png, png_infop info, Reader* reader) {
  if (setjmp(png_jmpbuf(png))) return false;
  std::size_t rowBytes = png_get_rowbytes(png, info);
  std::size_t stride =
      reader->pix ? std::size_t{4} * static_cast<std::size_t>(pixGetWpl(reader->pix)) : rowBytes;
  if (rowBytes > stride) png_error(png, "unexpected row size");
  png_bytep first = reader->pix ? reinterpret_cast<png_bytep>(pixGetData(reader->pix)) : nullptr;
  if (reader->passes > 1) {
    // Interlaced passes fill in each row several times, so every row must be at hand.
    reader->rows = static_cast<png_bytep*>(std::malloc(reader->height * sizeof(png_bytep)));
    if (!first)
      first = reader->image = static_cast<png_bytep>(std::malloc(rowBytes * reader->height));
    if (!reader->rows || !first) png_error(png, "there is not enough memory for the image");
    for (png_uint_32 y = 0; y < reader->height; ++y) reader->rows[y] = first + y * stride;
    png_read_image(png, reader->rows);
    if (reader->builder) {
      for (png_uint_32 y = 0; y < reader->height; ++y) reader->builder->addRow(reader->rows[y]);
    }
  } else {
    for (png_uint_32 y = 0; y < reader->height; ++y) {
      png_bytep row = reader->builder ? reader->row : first + y * stride;
      png_read_row(png, row, nullptr);
      if (reader->builder) reader->builder->addRow(row);
    }
  }
  return true;
}

}  // namespace

PIX* decodePNG(const std::uint8_t* bytes, std::size_t size, std::uint32_t maxLongSide,
               std::string* failure) {
  Reader reader{};
  reader.bytes = bytes;
  reader.size = size;
  png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, &reader, fail, ignoreWarning);
  png_infop info = png ? png_create_info_struct(png) : nullptr;
  std::optional<PictureBuilder> builder;
  std::vector<std::uint8_t> row;
  bool decoded = info && readHeader(png, info, maxLongSide > 0, maxLongSide, &reader);
  if (decoded && reader.depth == 1) {
    reader.pix = createPagePix(reader.width, reader.height, 1);
    if (reader.pix) pixSetResolution(reader.pix, reader.xResolution, reader.yResolution);
  } else if (decoded) {
    builder.emplace(reader.width, reader.height, reader.depth == 32 ? 4 : 1, reader.alpha,
                    maxLongSide, reader.xResolution, reader.yResolution);
    if (builder->ready()) reader.builder = &*builder;
    row.resize(png_get_rowbytes(png, info));
    reader.row = row.data();
  }
  if (decoded && !reader.pix && !reader.builder) {
    std::snprintf(reader.message, sizeof reader.message,
                  "there is not enough memory for the image");
    decoded = false;
  }
  decoded = decoded && readRows(png, info, &reader);
  png_destroy_read_struct(&png, info ? &info : nullptr, nullptr);
  std::free(reader.rows);
  std::free(reader.image);
  if (!decoded) {
    pixDestroy(&reader.pix);
    *failure = "the PNG image is corrupt or truncated";
    if (reader.message[0]) *failure += std::string(" (") + reader.message + ")";
    return nullptr;
  }
  if (builder) return builder->take();
  // PNG packs bilevel pixels first in the high bit of a byte; Leptonica keeps them in
  // 32-bit words with the first pixel in the high bit, and counts 1 as black where PNG
  // counts 1 as white.
  pixEndianByteSwap(reader.pix);
  pixInvert(reader.pix, reader.pix);
  return reader.pix;
}

std::optional<Data> pngDataForBitmap(const Bitmap& bitmap) {
  l_uint8* bytes = nullptr;
  size_t size = 0;
  if (pixWriteMemPng(&bytes, &size, bitmap.native().pix, 0.0f) != 0 || !bytes) {
    if (bytes) lept_free(bytes);
    return std::nullopt;
  }
  Data out(bytes, bytes + size);
  lept_free(bytes);
  return out;
}

}  // namespace corvel
