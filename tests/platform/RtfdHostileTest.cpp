#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/RTFD.h"
#include "Corvelbase/platform/TextAttachment.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

namespace fs = std::filesystem;

Data bytesOf(std::string_view text) { return Data(text.begin(), text.end()); }

std::string graphic(const std::string& name) {
  return "{{\\NeXTGraphic " + name + " \\width20 \\height20\n}\\'ac}";
}

TEST(RtfdHostile, UntrustedNamesNeverLeaveTheBundle) {
  testing::TempDir dir;
  // Files outside the bundle that a careless reader would pick up.
  ASSERT_TRUE(writeFileAtomically(dir.file("secret.txt"), bytesOf("outside")));
  std::string bundle = dir.file("doc.rtfd");
  fs::create_directories(bundle + "/sub");
  ASSERT_TRUE(writeFileAtomically(bundle + "/ok.png", bytesOf("inside")));
  ASSERT_TRUE(writeFileAtomically(bundle + "/sub/x.txt", bytesOf("nested")));
  fs::create_symlink(dir.file("secret.txt"), bundle + "/link.txt");
  fs::create_symlink(dir.path(), bundle + "/up");

  // The name as written inside the RTF, and the bytes the attachment gets (nullptr: none).
  std::pair<std::string, const char*> cases[] = {
      {"ok.png", "inside"},
      {"../secret.txt", nullptr},
      {dir.file("secret.txt"), nullptr},  // an absolute path
      {"sub/x.txt", nullptr},             // a separator, even inside the bundle
      {"sub\\'2fx.txt", nullptr},         // the same separator escaped
      {"", nullptr},
      {"link.txt", nullptr},  // a symbolic link to the outside
      {"up", nullptr},
      {"gone.png", nullptr},  // missing: a plain attachment, not a failed load
      {"ok.png", "inside"},   // still found after all of the above
  };
  std::string rtf = "{\\rtf1\\ansi ";
  for (const auto& [name, reads] : cases) rtf += "[" + graphic(name) + "]";
  rtf += "}";
  ASSERT_TRUE(writeFileAtomically(bundle + "/TXT.rtf", bytesOf(rtf)));

  auto fromDisk = attributedStringWithContentsOfRTFD(bundle);
  auto fromWrapper = attributedStringWithRTFDFileWrapper(*FileWrapper::initWithPath(bundle));
  for (const auto* read : {&fromDisk, &fromWrapper}) {
    ASSERT_TRUE(*read);
    const auto& text = **read;
    ASSERT_EQ(text.length(), std::size(cases) * 3);
    for (std::size_t i = 0; i < std::size(cases); ++i) {
      const auto& [name, reads] = cases[i];
      auto attachment = text.attachmentAtIndex(i * 3 + 1);
      ASSERT_TRUE(attachment) << name;
      EXPECT_FALSE(attachment->contents());
      auto wrapper = attachment->fileWrapper();
      EXPECT_EQ(wrapper ? wrapper->regularFileContents() : std::nullopt,
                reads ? std::optional(bytesOf(reads)) : std::nullopt)
          << name;
    }
  }
}

// Parses `rtf` alone; the result's text, or "<none>".
std::u16string textOf(const std::string& rtf) {
  auto read = attributedStringWithRTF(bytesOf(rtf));
  return read ? read->string() : u"<none>";
}

TEST(RtfdHostile, MalformedRtfLoadsWhatIsSafe) {
  // The document and the text it gives.
  const std::pair<std::string, std::u16string> cases[] = {
      // Not RTF at all.
      {"", u"<none>"},
      // Unbalanced groups: the document ends where its group closes, or at the end.
      {"{\\rtf1 a}}}} b", u"a"},
      // Truncated escapes are dropped, not misread.
      {"{\\rtf1 a\\'4", u"a"},
      {"{\\rtf1 a\\'zzb}", u"azzb"},
      {"{\\rtf1 a\\NeXTGraphic x.png b}", u"a"},
      // Unicode escapes at their limits.
      {"{\\rtf1 \\u-4?}", u"\uFFFC"},
      {"{\\rtf1 \\u128512?}", u"\U0001F600"},
      {"{\\rtf1 \\u99999999999999999999?x}", u"x"},
      {"{\\rtf1\\uc2 \\u233ab\\u233\\'e9\\'e9c}", u"\u00e9\u00e9c"},
      // Binary data is skipped by its count, even past the end.
      {"{\\rtf1 a\\bin3 }}}b}", u"ab"},
      {"{\\rtf1 a\\bin99999999999 b}", u"a"},
      // Ignorable and skipped destinations.
      {"{\\rtf1 a{\\*\\unknown zzz}b}", u"ab"},
      // Other code pages decode through ICU; unknown ones fall back to Windows-1252.
      {"{\\rtf1\\ansi\\ansicpg932 \\'93\\'fa}", u"\u65e5"},
      {"{\\rtf1\\ansi\\ansicpg99999 \\'e9}", u"\u00e9"},
  };
  for (const auto& [rtf, text] : cases) EXPECT_EQ(textOf(rtf), text) << rtf;
}

TEST(RtfdHostile, EveryTruncationOfAWrittenDocumentReadsAsItsBeginning) {
  AttributedString text(u"caf\u00e9 {\\} \U0001F600\n\tx\u2028y");
  text.appendAttributedString(AttributedString::attributedStringWithAttachment(
      TextAttachment::initWithData(bytesOf("data"), "public.data")));
  text.appendAttributedString(AttributedString(u"tail"));
  auto bundle = RTFDFileWrapperFromRange(text, Range{0, text.length()});
  Data rtf = *bundle->fileWrappers().at(RTFDTextFileName)->regularFileContents();
  const String& full = text.string();
  for (std::size_t cut = 5; cut <= rtf.size(); ++cut) {
    auto read = attributedStringWithRTF(Data(rtf.begin(), rtf.begin() + cut));
    ASSERT_TRUE(read) << cut;
    // Everything but the last unit is a prefix (a cut escape such as "\u23" for "\u233"
    // may give one other character).
    String got = read->string();
    if (!got.empty()) got.pop_back();
    EXPECT_EQ(full.substr(0, got.size()), got) << "cut at " << cut;
  }
  EXPECT_EQ(attributedStringWithRTF(rtf)->string(), full);
}

TEST(RtfdHostile, HugeTokensStayQuickAndDeepNestingIsRefused) {
  const std::pair<std::string, std::u16string> cases[] = {
      // A control word and a parameter of 4 MB: a reader that rescans or copies the token
      // as it grows takes minutes over these.
      {"{\\rtf1 a\\" + std::string(4u << 20, 'x') + " b}", u"ab"},
      {"{\\rtf1 a\\fs" + std::string(4u << 20, '9') + " b}", u"ab"},
      // Groups nested exactly as deep as allowed, the document's own included.
      {"{\\rtf1 a" + std::string(kMaxRTFGroupDepth - 1, '{') + "b", u"ab"},
  };
  for (const auto& [rtf, text] : cases) {
    Data bytes = bytesOf(rtf);
    auto started = std::chrono::steady_clock::now();
    auto read = attributedStringWithRTF(bytes);
    std::chrono::duration<double> took = std::chrono::steady_clock::now() - started;
    ASSERT_TRUE(read) << rtf.size();
    EXPECT_EQ(read->string(), text) << rtf.size();
    EXPECT_LT(took.count(), 5.0) << rtf.size();
  }
  // One group deeper, or a million, is refused as soon as the reader gets there.
  for (std::size_t groups : {kMaxRTFGroupDepth, std::size_t{1} << 20}) {
    auto started = std::chrono::steady_clock::now();
    EXPECT_FALSE(attributedStringWithRTF(bytesOf("{\\rtf1 a" + std::string(groups, '{') + "b")))
        << groups;
    EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(1));
  }
}

TEST(RtfdHostile, BrokenFlatFormsAreRefused) {
  AttributedString text(u"x");
  text.appendAttributedString(AttributedString::attributedStringWithAttachment(
      TextAttachment::initWithData(bytesOf("payload"), "public.data")));
  Data flat = RTFDFromRange(text, Range{0, 2});
  ASSERT_TRUE(attributedStringWithRTFD(flat));
  // Every strict prefix is refused whole: a bundle cut short is no bundle.
  for (std::size_t cut = 0; cut < flat.size(); ++cut)
    EXPECT_FALSE(attributedStringWithRTFD(Data(flat.begin(), flat.begin() + cut))) << cut;
  // Absurd counts and lengths fail without allocating them.
  // Each case writes a word little-endian over the bytes at an offset.
  const std::tuple<const char*, std::size_t, std::uint32_t> cases[] = {
      {"wrong magic", 0, 0x78787878},
      {"unknown record type", 8, 7},
      {"child count", 12, 0x7F0000FF},
      {"name length", 16, 0x7FFFFFFF}};
  for (const auto& [name, at, word] : cases) {
    Data broken = flat;
    for (int i = 0; i < 4; ++i) broken[at + i] = static_cast<std::uint8_t>(word >> (8 * i));
    EXPECT_FALSE(attributedStringWithRTFD(broken)) << name;
  }
  // A bundle without TXT.rtf, or with a directory in its place, is no document.
  auto noText = FileWrapper::initDirectoryWithFileWrappers(
      {{"a.txt", FileWrapper::initRegularFileWithContents(bytesOf("a"))}});
  EXPECT_FALSE(attributedStringWithRTFDFileWrapper(*noText));
  auto dirText = FileWrapper::initDirectoryWithFileWrappers(
      {{"TXT.rtf", FileWrapper::initDirectoryWithFileWrappers({})}});
  EXPECT_FALSE(attributedStringWithRTFDFileWrapper(*dirText));
  EXPECT_FALSE(attributedStringWithRTFDFileWrapper(*FileWrapper::initRegularFileWithContents({})));
}

}  // namespace
}  // namespace corvel
