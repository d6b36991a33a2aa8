#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <regex>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Image.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

Data fixtureBytes(const std::string& name) {
  auto bytes = readFile(testing::fixturePath("images/" + name));
  EXPECT_TRUE(bytes) << name;
  return bytes.value_or(Data{});
}

// The fixtures are 24 x 16: red grows with x, green with y, blue is full on the left half.
TEST(Image, DecodesEveryFormatWithItsPixels) {
  struct Case {
    const char* file;
    bool lossless;
  } cases[] = {{"sample.png", true}, {"sample.tif", true},   {"sample.bmp", true},
               {"sample.pnm", true}, {"sample.webp", false}, {"sample.jpg", false},
               {"sample.gif", false}};
  for (const auto& c : cases) {
    auto image =
        Image::initByReferencingFile(testing::fixturePath(std::string("images/") + c.file));
    auto bitmap = image->bitmap();
    ASSERT_TRUE(bitmap) << c.file << ": " << image->failureReason();
    EXPECT_EQ(image->size(), (Size{24, 16})) << c.file;
    Data rgba = bitmap->rgba();
    ASSERT_EQ(rgba.size(), 24u * 16 * 4);
    // Pixel (x=20, y=10): red 200, green 150, blue 0, opaque.
    const int expected[] = {200, 150, 0, 255};
    for (int k = 0; k < 4; ++k)
      EXPECT_NEAR(rgba[(10 * 24 + 20) * 4 + k], expected[k], c.lossless || k == 3 ? 0 : 24)
          << c.file << " channel " << k;
  }
}

TEST(Image, BadSourcesFailWithAReasonInsteadOfAPicture) {
  Data png = fixtureBytes("sample.png");
  Data truncated(png.begin(), png.begin() + static_cast<long>(png.size() / 2));
  Data corrupt = fixtureBytes("sample.jpg");
  std::fill(corrupt.begin() + 200, corrupt.end(), 0x5a);
  // A PNG whose header claims 30000 x 30000 pixels.
  Data huge = png;
  huge[16] = 0, huge[17] = 0, huge[18] = 0x75, huge[19] = 0x30;
  huge[20] = 0, huge[21] = 0, huge[22] = 0x75, huge[23] = 0x30;
  struct Case {
    const char* name;
    Data bytes;
    const char* reasonWord;
  } cases[] = {{"empty", {}, "not an image"},
               {"truncated png", truncated, "corrupt or truncated"},
               {"huge png", huge, "too large"}};
  testing::TempDir dir;
  for (const auto& c : cases) {
    EXPECT_FALSE(Image::initWithData(c.bytes)) << c.name;
    std::string path = dir.file(std::string(c.name) + ".img");
    ASSERT_TRUE(writeFileAtomically(path, c.bytes));
    auto image = Image::initByReferencingFile(path);
    EXPECT_FALSE(image->bitmap()) << c.name;
    EXPECT_NE(image->failureReason().find(c.reasonWord), std::string::npos)
        << c.name << ": " << image->failureReason();
    EXPECT_EQ(image->size(), Size{});
    EXPECT_TRUE(image->representations().empty());
    EXPECT_FALSE(image->jpegData(0.9));
  }
  // A JPEG with garbage after its header decodes to something or fails; never crashes.
  auto damaged = Image::initWithData(corrupt);
  EXPECT_TRUE(!damaged || damaged->size() == (Size{24, 16}));
  auto missing = Image::initByReferencingFile(dir.file("missing.png"));
  EXPECT_FALSE(missing->bitmap());
  EXPECT_NE(missing->failureReason().find("cannot be read"), std::string::npos);
  EXPECT_FALSE(Image::initByReferencingFile(dir.path())->bitmap());
}

// Regression: libjpeg's and Leptonica's TIFF reader's messages went to stderr (thousands of lines
// in four minutes of fuzzing) instead of into the failure reason.
TEST(Image, DamagedJpegAndTiffSayWhyInTheReasonNotOnStderr) {
  const std::pair<const char*, const char*> cases[] = {
      {"truncated.jpg", "JPEG image is corrupt or truncated (JPEG datastream contains no image)"},
      {"truncated.tif", "TIFF image is corrupt or truncated ("}};
  for (const auto& [file, reason] : cases) {
    ::testing::internal::CaptureStderr();
    auto image = Image::initByReferencingFile(testing::fixturePath(std::string("images/") + file));
    EXPECT_FALSE(image->bitmap()) << file;
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "") << file;
    std::string why = image->failureReason();
    EXPECT_NE(why.find(reason), std::string::npos) << file << ": " << why;
  }
}

TEST(Image, FileURLsAreReadAndOtherSchemesRefused) {
  std::string path = testing::fixturePath("images/sample.png");
  std::string escaped = std::regex_replace(path.substr(1), std::regex("/"), "%2F");
  for (const std::string& url :
       {"file://" + path, "file:" + path, "FILE://localhost" + path, "file:///" + escaped}) {
    auto image = Image::initByReferencingURL(url);
    EXPECT_TRUE(image->bitmap()) << url << ": " << image->failureReason();
  }
  const std::pair<std::string, const char*> refused[] = {
      {"https://example.com/a.png", "https"},
      {"file://otherhost" + path, "another host"},
      {"file://", "names no file"},
      {"no-scheme.png", "not a URL"}};
  for (const auto& [url, reasonWord] : refused) {
    auto image = Image::initByReferencingURL(url);
    EXPECT_FALSE(image->bitmap()) << url;
    EXPECT_NE(image->failureReason().find(reasonWord), std::string::npos)
        << url << ": " << image->failureReason();
  }
}

TEST(Image, JpegEncodingRoundTripsAndComposesAlphaOverWhite) {
  constexpr std::uint32_t kSide = 32;
  Data rgba;
  for (std::size_t i = 0; i < kSide * kSide; ++i)  // the top 8 rows transparent
    rgba.insert(rgba.end(), {10, 200, 30, std::uint8_t(i < kSide * 8 ? 0 : 255)});
  auto bitmap = Bitmap::fromRGBA(kSide, kSide, rgba.data(), rgba.size());
  ASSERT_TRUE(bitmap);
  auto image = Image::initWithBitmap(bitmap);
  auto best = image->jpegData(1.0), worst = image->jpegData(0.0), odd = image->jpegData(-5);
  ASSERT_TRUE(best && worst && odd);
  EXPECT_LT(worst->size(), best->size());
  EXPECT_EQ(*odd, *worst);  // out-of-range factors clamp
  auto decoded = Image::initWithData(*best);
  ASSERT_TRUE(decoded);
  Data back = decoded->bitmap()->rgba();
  EXPECT_NEAR(back[(2 * kSide + 5) * 4], 255, 8);  // transparent rows over white
  const int inner[] = {10, 200, 30};               // an opaque pixel keeps its colour
  for (int k = 0; k < 3; ++k) EXPECT_NEAR(back[(24 * kSide + 12) * 4 + k], inner[k], 12) << k;
  EXPECT_FALSE(Bitmap::fromRGBA(0, kSide, rgba.data(), rgba.size()));
  EXPECT_FALSE(Bitmap::fromRGBA(kSide, kSide + 1, rgba.data(), rgba.size()));  // too few bytes
  EXPECT_FALSE(Image::initWithBitmap(nullptr));
}

}  // namespace
}  // namespace corvel
