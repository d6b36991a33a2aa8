#include <gtest/gtest.h>

#include <chrono>
#include <random>

#include "Corvelbase/RVMXTextAttachment.h"
#include "Corvelbase/platform/Base64.h"
#include "Corvelbase/platform/Files.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

Data fixture(const std::string& name) {
  return readFile(testing::fixturePath("images/" + name)).value_or(Data{});
}

std::string text(const Data& d) { return std::string(d.begin(), d.end()); }

bool isJPEG(const Data& d) { return d.size() > 3 && d[0] == 0xFF && d[1] == 0xD8 && d[2] == 0xFF; }

TEST(Base64, LinesOf64EndWithCarriageReturnLineFeed) {
  std::mt19937 random(42);
  testing::TempDir dir;
  // Around the line length (48 bytes make exactly one line) and a long text.
  for (std::size_t size : {0, 1, 47, 48, 49, 97, 1000}) {
    Data bytes(size);
    for (auto& b : bytes) b = static_cast<std::uint8_t>(random());
    // coreutils' base64 wraps with LF; with CR LF instead it must give the same text,
    // without a break after the last line.
    ASSERT_TRUE(writeFileAtomically(dir.file("in"), bytes));
    auto reference = testing::runCommand("base64 -w 64 " + dir.file("in"));
    ASSERT_EQ(reference.status, 0);
    std::string expected;
    for (char ch : reference.output) expected += ch == '\n' ? "\r\n" : std::string(1, ch);
    if (!expected.empty()) expected.resize(expected.size() - 2);
    std::string encoded = text(encodedBase64Data(bytes));
    EXPECT_EQ(encoded, expected) << size << " bytes";
    EXPECT_EQ(base64Decoding(encoded), bytes);
  }
  auto lineFeedOnly = Base64Encoding64CharacterLineLength | Base64EncodingEndLineWithLineFeed;
  EXPECT_EQ(base64Encoding(Data(49, 0), lineFeedOnly).find('\r'), std::string::npos);
  for (const char* bad : {"A", "AB=C", "A===", "AB*D", "AA==AA=="})
    EXPECT_FALSE(base64Decoding(bad)) << bad;
  // Text past the limit is refused without being read.
  std::string huge(kMaxBase64TextLength + 1, 'A');
  auto start = std::chrono::steady_clock::now();
  EXPECT_FALSE(base64Decoding(huge));
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(100));
}

TEST(BaseEncode, Base64ChoosesImageThenContentsThenFile) {
  Data png = fixture("sample.png");
  auto picture = Image::initWithData(fixture("sample.gif"));
  auto pngFile = FileWrapper::initRegularFileWithContents(png);
  enum Source { kJPEGOfImage, kContentsAsTheyAre, kJPEGOfFile, kNothing };
  struct Case {
    const char* name;
    std::shared_ptr<Image> image;
    std::optional<Data> contents;
    std::shared_ptr<FileWrapper> wrapper;
    Source source;
  } cases[] = {
      {"image over contents and file", picture, png, pngFile, kJPEGOfImage},
      {"png contents are not re-encoded", nullptr, png, pngFile, kContentsAsTheyAre},
      {"empty contents", nullptr, Data{}, pngFile, kContentsAsTheyAre},
      {"file decoded and re-encoded", nullptr, std::nullopt, pngFile, kJPEGOfFile},
      {"file that is no image", nullptr, std::nullopt,
       FileWrapper::initRegularFileWithContents(Data{1, 2, 3}), kNothing},
      // An image that cannot be written ends the search: contents are not tried.
      {"undecodable image", Image::initByReferencingFile("/nonexistent/x.png"), png, nullptr,
       kNothing},
      {"nothing", nullptr, std::nullopt, nullptr, kNothing},
  };
  for (const auto& c : cases) {
    auto a = TextAttachment::initWithData(c.contents, "public.png");
    a->setImage(c.image);
    a->setFileWrapper(c.wrapper);
    auto encoded = a->encodedBase64Data();
    auto decoded = encoded ? base64Decoding(text(*encoded)) : std::nullopt;
    EXPECT_EQ(decoded.has_value(), c.source != kNothing) << c.name;
    if (c.source == kContentsAsTheyAre) {
      EXPECT_EQ(decoded, c.contents) << c.name;
    } else if (decoded) {
      EXPECT_TRUE(isJPEG(*decoded)) << c.name;
      EXPECT_EQ(testing::decodedSize(decoded), (Size{24, 16})) << c.name;
    }
  }
}

}  // namespace
}  // namespace corvel
