// What our PNG path adds to libpng: the colour types turned into RGBA, reduction while
// decoding (rows straight from the file) against block means computed pixel by pixel, and
// damaged data refused quietly. Images are written here with libpng.
#include <gtest/gtest.h>
#include <png.h>

#include <cmath>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"
#include "support/FakeRecognizer.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

struct Kind {
  const char* name;
  int colorType, bitDepth, channels;
};
const Kind kKinds[] = {{"bilevel", PNG_COLOR_TYPE_GRAY, 1, 1},
                       {"grey", PNG_COLOR_TYPE_GRAY, 8, 1},
                       {"rgba", PNG_COLOR_TYPE_RGB_ALPHA, 8, 4},
                       {"palette", PNG_COLOR_TYPE_PALETTE, 8, 1}};

// A scrambled sample, so that a swapped row, column or channel shows.
int sampleAt(int x, int y, int c, int depth) {
  unsigned h = unsigned(x) * 73856093u ^ unsigned(y) * 19349663u ^ unsigned(c + 1) * 83492791u;
  return int((h ^ h >> 13) % (1u << depth));
}
// RGBA at (x, y) by definition; the palette maps i to (i, 255 - i, i / 2).
std::array<int, 4> rgbaAt(const Kind& k, int x, int y) {
  auto s = [&](int c) { return sampleAt(x, y, c, k.bitDepth) * 255 / ((1 << k.bitDepth) - 1); };
  if (k.colorType == PNG_COLOR_TYPE_PALETTE) return {s(0), 255 - s(0), s(0) / 2, 255};
  if (k.channels == 1) return {s(0), s(0), s(0), 255};
  return {s(0), s(1), s(2), s(3)};
}

Data writePng(const Kind& k, int width, int height) {
  Data out;
  png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  png_set_write_fn(
      png, &out,
      [](png_structp p, png_bytep b, png_size_t n) {
        static_cast<Data*>(png_get_io_ptr(p))
            ->insert(static_cast<Data*>(png_get_io_ptr(p))->end(), b, b + n);
      },
      nullptr);
  png_set_IHDR(png, info, png_uint_32(width), png_uint_32(height), k.bitDepth, k.colorType,
               PNG_INTERLACE_NONE, PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  png_color palette[256];
  for (int i = 0; i < 256; ++i) palette[i] = {png_byte(i), png_byte(255 - i), png_byte(i / 2)};
  if (k.colorType == PNG_COLOR_TYPE_PALETTE) png_set_PLTE(png, info, palette, 256);
  png_write_info(png, info);
  png_set_packing(png);  // a bilevel row below holds a sample per byte
  std::vector<png_byte> row;
  for (int y = 0; y < height; ++y) {
    row.clear();
    for (int x = 0; x < width; ++x)
      for (int c = 0; c < k.channels; ++c) row.push_back(png_byte(sampleAt(x, y, c, k.bitDepth)));
    png_write_row(png, row.data());
  }
  png_write_end(png, info);
  png_destroy_write_struct(&png, &info);
  return out;
}

// The picture reduced to fit `maxLongSide`: each source pixel adds to the target pixel it
// falls in, and each target pixel is the rounded mean of its block.
Data blockMeans(const Kind& k, int width, int height, int maxLongSide) {
  maxLongSide = std::min(maxLongSide, std::max(width, height));
  double scale = double(maxLongSide) / std::max(width, height);
  auto side = [&](int n) { return std::clamp(int(std::floor(n * scale)), 1, maxLongSide); };
  int tw = side(width), th = side(height);
  std::vector<std::array<double, 5>> sums(std::size_t(tw * th));
  for (int y = 0; y < height; ++y)
    for (int x = 0; x < width; ++x) {
      auto& sum = sums[std::size_t((y * th / height) * tw + x * tw / width)];
      auto pixel = rgbaAt(k, x, y);
      for (std::size_t c = 0; c < 4; ++c) sum[c] += pixel[c];
      sum[4] += 1;
    }
  Data out;
  for (const auto& sum : sums)
    for (std::size_t c = 0; c < 4; ++c)
      out.push_back(std::uint8_t(std::floor(sum[c] / sum[4] + 0.5)));
  return out;
}

TEST(ImagePNG, EachKindReadsWholeAndReducedWhileDecodingToItsPixels) {
  struct Fit {
    int width, height, maxLongSide;
  } fits[] = {{11, 7, 11}, {37, 23, 10}, {23, 37, 30}, {300, 3, 100}};
  testing::TempDir dir;
  for (const Kind& kind : kKinds) {
    for (const Fit& f : fits) {
      SCOPED_TRACE(std::string(kind.name) + " " + std::to_string(f.width) + "x" +
                   std::to_string(f.height) + " to " + std::to_string(f.maxLongSide));
      std::string path = dir.file("p.png");
      ASSERT_TRUE(writeFileAtomically(path, writePng(kind, f.width, f.height)));
      auto image = Image::initByReferencingFile(path);
      auto bitmap = image->bitmapFittingLongSide(std::uint32_t(f.maxLongSide));
      ASSERT_TRUE(bitmap) << image->failureReason();
      EXPECT_EQ(bitmap->rgba(), blockMeans(kind, f.width, f.height, f.maxLongSide));
      EXPECT_EQ(image->size(), (Size{double(f.width), double(f.height)}));
    }
  }
}

TEST(ImagePNG, DamagedOrCutDataIsRefusedWithAReasonAndNothingOnStderr) {
  Data png = writePng(kKinds[1], 40, 30);
  auto idat = std::search(png.begin(), png.end(), std::begin("IDAT"), std::end("IDAT") - 1);
  ASSERT_NE(idat, png.end());
  Data damaged = png, cut(png.begin(), idat + 10);
  damaged[std::size_t(idat - png.begin()) + 6] ^= 0xff;  // inside the compressed pixels
  testing::TempDir dir;
  for (const Data* bytes : {&damaged, &cut}) {
    ASSERT_TRUE(writeFileAtomically(dir.file("bad.png"), *bytes));
    ::testing::internal::CaptureStderr();
    auto image = Image::initByReferencingFile(dir.file("bad.png"));
    EXPECT_FALSE(image->bitmapFittingLongSide(10));
    EXPECT_FALSE(Image::initWithData(*bytes));
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "");
    EXPECT_NE(image->failureReason().find("corrupt"), std::string::npos) << image->failureReason();
  }
}

// A handler gives a recogniser the size it asks for: reduced for a fast request alone, whole
// when another request on the same image needs every pixel.
TEST(ImagePNG, HandlersReduceImagesToTheSizeTheRecogniserCanUse) {
  auto fake = std::make_shared<testing::FakeRecognizer>();
  fake->setFastMaxLongSide(10);
  PlatformRegistry::setTextRecognizer(fake);
  testing::TempDir dir;
  ASSERT_TRUE(writeFileAtomically(dir.file("p.png"), writePng(kKinds[1], 40, 20)));
  auto request = [](std::int64_t level) {
    auto r = TextRecognitionRequest::initWithCompletionHandler(nullptr);
    r->setRecognitionLevel(level);
    return r;
  };
  for (bool withAccurate : {false, true}) {
    std::vector<std::shared_ptr<TextRecognitionRequest>> requests{
        request(TextRecognitionLevelFast)};
    if (withAccurate) requests.push_back(request(TextRecognitionLevelAccurate));
    ImageRequestHandler::initWithImage(Image::initByReferencingFile(dir.file("p.png")), {})
        ->performRequests(requests, nullptr);
  }
  auto seen = fake->requests();
  PlatformRegistry::setTextRecognizer(nullptr);
  ASSERT_EQ(seen.size(), 3u);
  EXPECT_EQ(std::pair(seen[0].width, seen[0].height), std::pair(10u, 5u));
  EXPECT_EQ(std::pair(seen[1].width, seen[2].width), std::pair(40u, 40u));
}

}  // namespace
}  // namespace corvel
