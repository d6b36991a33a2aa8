// PNG reading against images written here with libpng in every colour type, bit depth
// and interlacing, so each transformation the reader asks libpng for is checked against
// what the pixels are by definition; and reduction to a smaller size, while decoding and
// afterwards, against block means computed pixel by pixel.
#include <gtest/gtest.h>
#include <png.h>

#include <array>
#include <cmath>
#include <csetjmp>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"
#include "support/FakeRecognizer.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

// 11 x 7 crosses every Adam7 pass boundary.
constexpr int kWidth = 11, kHeight = 7;

struct Variant {
  const char* name;
  int colorType;
  int bitDepth;
  bool interlaced = false;
  bool transparentKey = false;  // a tRNS chunk naming one colour (or palette entry)
  // One row filter for every row (PNG_FILTER_*), with the data split over many small
  // chunks; 0 lets libpng choose and keeps one chunk.
  int filter = 0;
};

// The sample of channel `c` at (x, y) for a bit depth: scrambled, so that a swapped byte,
// row or channel shows and the row filters meet every case (Paeth's ties among them).
int sampleAt(int x, int y, int c, int bitDepth) {
  unsigned hash = static_cast<unsigned>(x) * 73856093u ^ static_cast<unsigned>(y) * 19349663u ^
                  static_cast<unsigned>(c + 1) * 83492791u;
  hash ^= hash >> 13;
  return static_cast<int>(hash % (1u << bitDepth));
}

// What an 8-bit reader must make of a sample: low depths scale up, 16 bits keep the high byte.
int toEight(int sample, int bitDepth) {
  if (bitDepth == 16) return sample >> 8;
  return sample * 255 / ((1 << bitDepth) - 1);
}

void appendBytes(png_structp png, png_bytep bytes, png_size_t length) {
  auto* out = static_cast<Data*>(png_get_io_ptr(png));
  out->insert(out->end(), bytes, bytes + length);
}

// The palette maps index i to (i*9, 255-i*9, i*3) mod 256.
png_color paletteEntry(int i) {
  return {static_cast<png_byte>(i * 9), static_cast<png_byte>(255 - i * 9),
          static_cast<png_byte>(i * 3)};
}

Data writePng(const Variant& variant, int width = kWidth, int height = kHeight) {
  Data out;
  png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  if (setjmp(png_jmpbuf(png))) {
    png_destroy_write_struct(&png, &info);
    return {};
  }
  png_set_write_fn(png, &out, appendBytes, nullptr);
  png_set_IHDR(png, info, static_cast<png_uint_32>(width), static_cast<png_uint_32>(height),
               variant.bitDepth, variant.colorType,
               variant.interlaced ? PNG_INTERLACE_ADAM7 : PNG_INTERLACE_NONE,
               PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  png_color palette[256];
  for (int i = 0; i < 256; ++i) palette[i] = paletteEntry(i);
  if (variant.colorType == PNG_COLOR_TYPE_PALETTE)
    png_set_PLTE(png, info, palette, 1 << variant.bitDepth);
  png_byte opaqueAfterFirst[1] = {0};  // palette entry 0 transparent
  png_color_16 key{};                  // the colour of pixel (0, 0) transparent
  key.gray = static_cast<png_uint_16>(sampleAt(0, 0, 0, variant.bitDepth));
  key.red = key.gray;
  key.green = static_cast<png_uint_16>(sampleAt(0, 0, 1, variant.bitDepth));
  key.blue = static_cast<png_uint_16>(sampleAt(0, 0, 2, variant.bitDepth));
  if (variant.transparentKey) png_set_tRNS(png, info, opaqueAfterFirst, 1, &key);
  png_set_pHYs(png, info, 11811, 11811, PNG_RESOLUTION_METER);  // 300 dpi
  if (variant.filter) {
    png_set_filter(png, PNG_FILTER_TYPE_BASE, variant.filter);
    png_set_compression_buffer_size(png, 32);
  }
  png_write_info(png, info);
  if (variant.bitDepth < 8) png_set_packing(png);  // rows below hold a sample per byte
  int channels = png_get_channels(png, info);      // a palette index counts as one
  int bytesPerSample = variant.bitDepth == 16 ? 2 : 1;
  std::vector<std::vector<png_byte>> rows(static_cast<std::size_t>(height));
  std::vector<png_bytep> pointers;
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      for (int c = 0; c < channels; ++c) {
        int sample = sampleAt(x, y, c, variant.bitDepth);
        if (bytesPerSample == 2)
          rows[static_cast<std::size_t>(y)].push_back(static_cast<png_byte>(sample >> 8));
        rows[static_cast<std::size_t>(y)].push_back(static_cast<png_byte>(sample & 0xff));
      }
    }
    pointers.push_back(rows[static_cast<std::size_t>(y)].data());
  }
  png_write_image(png, pointers.data());
  png_write_end(png, info);
  png_destroy_write_struct(&png, &info);
  return out;
}

// The RGBA the reader must produce at (x, y).
std::array<int, 4> expectedAt(const Variant& variant, int x, int y) {
  auto s = [&](int c) { return sampleAt(x, y, c, variant.bitDepth); };
  // The key makes every pixel of the colour of (0, 0) transparent.
  auto first = [&](int c) { return sampleAt(0, 0, c, variant.bitDepth); };
  bool keyed = variant.transparentKey && s(0) == first(0) &&
               (variant.colorType == PNG_COLOR_TYPE_GRAY || (s(1) == first(1) && s(2) == first(2)));
  switch (variant.colorType) {
    case PNG_COLOR_TYPE_PALETTE: {
      png_color entry = paletteEntry(s(0));
      return {entry.red, entry.green, entry.blue, variant.transparentKey && s(0) == 0 ? 0 : 255};
    }
    case PNG_COLOR_TYPE_GRAY: {
      int grey = toEight(s(0), variant.bitDepth);
      return {grey, grey, grey, keyed ? 0 : 255};
    }
    case PNG_COLOR_TYPE_GRAY_ALPHA: {
      int grey = toEight(s(0), variant.bitDepth);
      return {grey, grey, grey, toEight(s(1), variant.bitDepth)};
    }
    case PNG_COLOR_TYPE_RGB:
      return {toEight(s(0), variant.bitDepth), toEight(s(1), variant.bitDepth),
              toEight(s(2), variant.bitDepth), keyed ? 0 : 255};
    default:
      return {toEight(s(0), variant.bitDepth), toEight(s(1), variant.bitDepth),
              toEight(s(2), variant.bitDepth), toEight(s(3), variant.bitDepth)};
  }
}

// The RGBA of the picture `variant` at `width` x `height`, reduced to fit `maxLongSide` when
// that is smaller, computed pixel by pixel: each source pixel adds to the target pixel it
// falls in.
Data pixelsByDefinition(const Variant& variant, int width, int height, int maxLongSide) {
  maxLongSide = std::min(maxLongSide, std::max(width, height));
  double scale = static_cast<double>(maxLongSide) / std::max(width, height);
  auto side = [&](int n) {
    return std::clamp(static_cast<int>(std::floor(n * scale)), 1, maxLongSide);
  };
  int targetWidth = side(width), targetHeight = side(height);
  std::vector<std::array<double, 5>> sums(static_cast<std::size_t>(targetWidth * targetHeight));
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      auto& sum = sums[static_cast<std::size_t>((y * targetHeight / height) * targetWidth +
                                                x * targetWidth / width)];
      auto pixel = expectedAt(variant, x, y);
      for (int c = 0; c < 4; ++c)
        sum[static_cast<std::size_t>(c)] += pixel[static_cast<std::size_t>(c)];
      sum[4] += 1;
    }
  }
  Data out;
  for (const auto& sum : sums) {
    for (int c = 0; c < 4; ++c) {
      out.push_back(
          static_cast<std::uint8_t>(std::floor(sum[static_cast<std::size_t>(c)] / sum[4] + 0.5)));
    }
  }
  return out;
}

TEST(ImagePNG, EveryColourTypeDepthAndInterlacingDecodesToItsPixels) {
  const Variant variants[] = {
      {"grey 1", PNG_COLOR_TYPE_GRAY, 1},
      {"grey 1 interlaced", PNG_COLOR_TYPE_GRAY, 1, true},
      {"grey 1 keyed", PNG_COLOR_TYPE_GRAY, 1, false, true},
      {"grey 2", PNG_COLOR_TYPE_GRAY, 2},
      {"grey 4 interlaced", PNG_COLOR_TYPE_GRAY, 4, true},
      {"grey 8 interlaced", PNG_COLOR_TYPE_GRAY, 8, true},
      {"grey 8 keyed", PNG_COLOR_TYPE_GRAY, 8, false, true},
      {"grey 16", PNG_COLOR_TYPE_GRAY, 16},
      {"grey+alpha 8", PNG_COLOR_TYPE_GRAY_ALPHA, 8},
      {"grey+alpha 16 interlaced", PNG_COLOR_TYPE_GRAY_ALPHA, 16, true},
      {"rgb 8", PNG_COLOR_TYPE_RGB, 8},
      {"rgb 8 interlaced keyed", PNG_COLOR_TYPE_RGB, 8, true, true},
      {"rgba 16 interlaced", PNG_COLOR_TYPE_RGB_ALPHA, 16, true},
      {"palette 2", PNG_COLOR_TYPE_PALETTE, 2},
      {"palette 4 interlaced", PNG_COLOR_TYPE_PALETTE, 4, true},
      {"palette 8 with a transparent entry", PNG_COLOR_TYPE_PALETTE, 8, false, true},
      {"grey 8 sub", PNG_COLOR_TYPE_GRAY, 8, false, false, PNG_FILTER_SUB},
      {"grey 8 up", PNG_COLOR_TYPE_GRAY, 8, false, false, PNG_FILTER_UP},
      {"grey 8 average", PNG_COLOR_TYPE_GRAY, 8, false, false, PNG_FILTER_AVG},
      {"grey 8 paeth", PNG_COLOR_TYPE_GRAY, 8, false, false, PNG_FILTER_PAETH},
      {"rgb 8 paeth", PNG_COLOR_TYPE_RGB, 8, false, false, PNG_FILTER_PAETH},
      {"rgba 8 sub", PNG_COLOR_TYPE_RGB_ALPHA, 8, false, false, PNG_FILTER_SUB},
  };
  for (const auto& variant : variants) {
    SCOPED_TRACE(variant.name);
    auto image = Image::initWithData(writePng(variant));
    ASSERT_TRUE(image);
    EXPECT_EQ(image->size(), (Size{kWidth, kHeight}));
    EXPECT_EQ(image->bitmap()->rgba(), pixelsByDefinition(variant, kWidth, kHeight, kWidth));
  }
}

TEST(ImagePNG, DamagedDataIsRefusedWithLibpngsReason) {
  Data png = writePng({"grey 8", PNG_COLOR_TYPE_GRAY, 8});
  ASSERT_FALSE(png.empty());
  // The image data: its length precedes its type, its checksum follows it.
  auto type = std::search(png.begin(), png.end(), std::begin("IDAT"), std::end("IDAT") - 1);
  ASSERT_NE(type, png.end());
  std::size_t data = static_cast<std::size_t>(type - png.begin()) + 4;
  std::size_t length = (std::size_t{type[-2]} << 8) | type[-1];
  Data damaged = png, badChecksum = png;
  damaged[data + 2] ^= 0xff;               // inside the compressed pixels
  badChecksum[data + length + 1] ^= 0xff;  // the pixels intact, their checksum wrong
  Data cut(png.begin(), png.begin() + static_cast<long>(data + length / 2));
  struct Case {
    const char* name;
    const Data& bytes;
  } cases[] = {{"damaged", damaged}, {"bad checksum", badChecksum}, {"cut", cut}};
  for (const auto& c : cases) {
    ::testing::internal::CaptureStderr();
    auto image = Image::initWithData(c.bytes);
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "") << c.name;  // libpng printed nothing
    EXPECT_FALSE(image) << c.name;
  }
}

TEST(ImageReduce, ReducedPixelsAreTheMeansOfTheBlocksTheyCover) {
  const Variant variants[] = {
      {"grey 1", PNG_COLOR_TYPE_GRAY, 1},
      {"grey 8", PNG_COLOR_TYPE_GRAY, 8},
      {"grey 16", PNG_COLOR_TYPE_GRAY, 16},
      {"rgb 8", PNG_COLOR_TYPE_RGB, 8},
      {"rgba 8", PNG_COLOR_TYPE_RGB_ALPHA, 8},
      {"grey+alpha 8", PNG_COLOR_TYPE_GRAY_ALPHA, 8},
      {"palette 4 keyed", PNG_COLOR_TYPE_PALETTE, 4, false, true},
      {"grey 8 interlaced", PNG_COLOR_TYPE_GRAY, 8, true},
  };
  struct Size3 {
    int width, height, maxLongSide;
  } sizes[] = {{37, 23, 10}, {23, 37, 30}, {300, 3, 100}, {9, 9, 8}};
  testing::TempDir dir;
  for (const auto& variant : variants) {
    for (const auto& size : sizes) {
      SCOPED_TRACE(std::string(variant.name) + " " + std::to_string(size.width) + "x" +
                   std::to_string(size.height) + " to " + std::to_string(size.maxLongSide));
      Data png = writePng(variant, size.width, size.height);
      std::string path = dir.file("reduce.png");
      ASSERT_TRUE(writeFileAtomically(path, png));
      // Reduced while decoded (rows straight from the file) and after decoding whole.
      auto referenced = Image::initByReferencingFile(path);
      auto whileDecoding =
          referenced->bitmapFittingLongSide(static_cast<std::uint32_t>(size.maxLongSide));
      auto afterDecoding = Image::initWithData(png)->bitmapFittingLongSide(
          static_cast<std::uint32_t>(size.maxLongSide));
      ASSERT_TRUE(whileDecoding && afterDecoding);
      Data expected = pixelsByDefinition(variant, size.width, size.height, size.maxLongSide);
      EXPECT_EQ(whileDecoding->rgba(), expected);
      EXPECT_EQ(afterDecoding->rgba(), expected);
      EXPECT_EQ(referenced->size(),
                (Size{static_cast<double>(size.width), static_cast<double>(size.height)}));
    }
  }
  // Pictures that fit, and no limit, come whole.
  auto image = Image::initWithData(writePng(variants[1]));
  EXPECT_EQ(image->bitmapFittingLongSide(kWidth), image->bitmap());
  EXPECT_EQ(image->bitmapFittingLongSide(0), image->bitmap());
}

// A handler gives a recogniser the size it asks for: reduced for a fast request alone, whole
// when another request on the same image needs every pixel.
TEST(ImageReduce, HandlersReduceImagesToTheSizeTheRecogniserCanUse) {
  auto fake = std::make_shared<testing::FakeRecognizer>();
  fake->setFastMaxLongSide(10);
  PlatformRegistry::setTextRecognizer(fake);
  testing::TempDir dir;
  std::string path = dir.file("page.png");
  ASSERT_TRUE(writeFileAtomically(path, writePng({"grey 8", PNG_COLOR_TYPE_GRAY, 8}, 40, 20)));
  auto request = [](std::int64_t level) {
    auto r = TextRecognitionRequest::initWithCompletionHandler(nullptr);
    r->setRecognitionLevel(level);
    return r;
  };
  Error error;
  ImageRequestHandler::initWithImage(Image::initByReferencingFile(path), {})
      ->performRequests({request(TextRecognitionLevelFast)}, &error);
  ImageRequestHandler::initWithImage(Image::initByReferencingFile(path), {})
      ->performRequests({request(TextRecognitionLevelFast), request(TextRecognitionLevelAccurate)},
                        &error);
  auto seen = fake->requests();
  PlatformRegistry::setTextRecognizer(nullptr);
  ASSERT_EQ(seen.size(), 3u);
  EXPECT_EQ(seen[0].width, 10u);
  EXPECT_EQ(seen[0].height, 5u);
  EXPECT_EQ(seen[1].width, 40u);
  EXPECT_EQ(seen[2].width, 40u);
}

}  // namespace
}  // namespace corvel
