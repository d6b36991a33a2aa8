#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <set>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/RTFD.h"
#include "Corvelbase/platform/TextAttachment.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

namespace fs = std::filesystem;

Data bytesOf(std::string_view text) { return Data(text.begin(), text.end()); }

Data fixture(const std::string& name) {
  return readFile(testing::fixturePath("images/" + name)).value_or(Data{});
}

// Text that exercises every escape of the writer: RTF's own specials, line breaks of
// every kind, tabs, Latin-1, characters outside Windows-1252, astral characters, control
// characters, a lone surrogate and a plain attachment character without an attachment.
const String kTrickyText =
    String(
        u"Hello {world} back\\slash \\par {\\rtf1}\n\ttab\r\nCR LF\rCR\u2028LS\u2029PS "
        u"caf\u00e9 \u00a0nbsp \u20ac \u2014 \u65e5\u672c\u8a9e \U0001F600 \U00010348 "
        u"\x01\x1f\x7f\u0080\u009f ") +
    char16_t(0xDC00) + u" \uFFFC \uFFFF end";

// Attachments of every source the writer knows, one of them standing twice.
AttributedString sampleText() {
  auto notesFile = FileWrapper::initRegularFileWithContents(bytesOf("notes\n"));
  notesFile->setPreferredFilename("notes.txt");
  auto notes = TextAttachment::initWithFileWrapper(notesFile);
  notes->setBounds(Rect(0, 0, 32, 16));
  auto picture = TextAttachment::init();
  picture->setImage(Image::initWithData(fixture("sample.png")));
  AttributedString text(kTrickyText);
  for (const auto& a :
       {TextAttachment::initWithData(fixture("sample.png"), "public.png"), notes, notes, picture}) {
    text.appendAttributedString(AttributedString::attributedStringWithAttachment(a));
    text.appendAttributedString(AttributedString(u" | "));
  }
  return text;
}

// Checks that `read` is sampleText(): the same characters, an attachment exactly where it
// has one, and files with the expected names and bytes.
void expectSampleText(const std::optional<AttributedString>& read) {
  AttributedString written = sampleText();
  ASSERT_TRUE(read);
  ASSERT_EQ(read->string(), written.string());
  std::vector<std::shared_ptr<TextAttachment>> found;
  for (std::uint64_t i = 0; i < read->length(); ++i) {
    EXPECT_EQ(read->attachmentAtIndex(i) != nullptr, written.attachmentAtIndex(i) != nullptr)
        << "at " << i;
    if (auto a = read->attachmentAtIndex(i)) found.push_back(a);
  }
  ASSERT_EQ(found.size(), 4u);
  for (const auto& a : found) ASSERT_TRUE(a->fileWrapper());
  EXPECT_EQ(found[0]->fileWrapper()->regularFileContents(), fixture("sample.png"));
  EXPECT_EQ(found[1]->fileWrapper()->regularFileContents(), bytesOf("notes\n"));
  // One file, one wrapper: the attachment that stood twice shares it when read back, named
  // by its file.
  EXPECT_EQ(found[1]->fileWrapper(), found[2]->fileWrapper());
  EXPECT_EQ(found[1]->fileWrapper()->preferredFilename(), "notes.txt");
  EXPECT_EQ(found[1]->bounds(), Rect(0, 0, 32, 16));
  // The picture without a file went out as JPEG and decodes to the same size.
  auto jpeg = Image::initWithData(*found[3]->fileWrapper()->regularFileContents());
  EXPECT_EQ(jpeg ? jpeg->size() : Size{}, (Size{24, 16}));
  EXPECT_EQ(found[3]->bounds(), Rect(0, 0, 24, 16));
}

TEST(Rtfd, BundlesAndFlatFormsRoundTripTextAndFiles) {
  testing::TempDir dir;
  AttributedString sample = sampleText();
  std::string path = dir.file("doc.rtfd");
  ASSERT_TRUE(writeRTFDToPath(sample, path));
  std::set<std::string> names;
  for (const auto& entry : fs::directory_iterator(path)) names.insert(entry.path().filename());
  EXPECT_EQ(names,
            (std::set<std::string>{"TXT.rtf", "Attachment.png", "notes.txt", "Attachment.jpeg"}));
  // The bundle gets the permissions of an ordinary new directory, not a private one.
  mode_t mask = umask(0);
  umask(mask);
  EXPECT_EQ(static_cast<mode_t>(fs::status(path).permissions()), 0777 & ~mask);
  auto read = attributedStringWithContentsOfRTFD(path);
  expectSampleText(read);
  // Saving what was read gives the same bundle again, over the old one, and no staging
  // directory is left beside it.
  ASSERT_TRUE(writeRTFDToPath(*read, path));
  expectSampleText(attributedStringWithContentsOfRTFD(path));
  EXPECT_EQ(std::distance(fs::directory_iterator(dir.path()), fs::directory_iterator()), 1);

  Data flat = RTFDFromRange(sample, Range{0, sample.length()});
  expectSampleText(attributedStringWithRTFD(flat));
  // A range writes only its part.
  auto part = attributedStringWithRTFD(RTFDFromRange(sample, Range{6, 7}));
  EXPECT_EQ(part.value_or(AttributedString()).string(), u"{world}");

  // The tool prints the text of both forms, attachments by name; a missing file is
  // unreadable input (2).
  ASSERT_TRUE(writeFileAtomically(dir.file("doc.flat"), flat));
  std::string expected =
      toUTF8(kTrickyText) + "[Attachment.png] | [notes.txt] | [notes.txt] | [Attachment.jpeg] | \n";
  for (const char* name : {"doc.rtfd", "doc.flat", "none"}) {
    auto result = testing::runCommand(CORVEL_TOOL_PATH + std::string(" rtfd ") + dir.file(name) +
                                      " 2>/dev/null");
    bool missing = name == std::string("none");
    EXPECT_EQ(result.status, missing ? 2 : 0) << name;
    EXPECT_EQ(result.output, missing ? "" : expected) << name;
  }

  // An outside reader finds the text (unrtf writes Latin-1 in its text mode).
  auto unrtf = testing::runCommand("unrtf --text '" + path + "/TXT.rtf' 2>/dev/null");
  ASSERT_EQ(unrtf.status, 0) << unrtf.output;
  for (const char* wanted : {"Hello {world} back\\slash \\par {\\rtf1}", "caf\xe9 ", " end"})
    EXPECT_NE(unrtf.output.find(wanted), std::string::npos) << wanted << "\n" << unrtf.output;
}

TEST(Rtfd, AttachmentNamesAreMadeSafeAndUnique) {
  struct Case {
    const char* wanted;
    const char* written;
  } cases[] = {
      {"TXT.rtf", "TXT 2.rtf"},  {"a/b.png", "a_b.png"},
      {"..", "Attachment"},      {"  spaced.png  ", "spaced.png"},
      {"tab\tname", "tab_name"}, {"a/b.png", "a_b 2.png"},
      {"", "Attachment 2"},      {"caf\xc3\xa9 {1}.txt", "caf\xc3\xa9 {1}.txt"},
  };
  AttributedString text;
  for (const auto& c : cases) {
    auto w = FileWrapper::initRegularFileWithContents(bytesOf(c.wanted));
    w->setPreferredFilename(c.wanted);
    text.appendAttributedString(
        AttributedString::attributedStringWithAttachment(TextAttachment::initWithFileWrapper(w)));
  }
  // An attachment with nothing to write goes out as a plain character and adds no file.
  text.appendAttributedString(
      AttributedString::attributedStringWithAttachment(TextAttachment::init()));
  auto bundle = RTFDFileWrapperFromRange(text, Range{0, text.length()});
  EXPECT_EQ(bundle->fileWrappers().size(), std::size(cases) + 1);
  auto read = attributedStringWithRTFDFileWrapper(*bundle);
  ASSERT_TRUE(read);
  ASSERT_EQ(read->length(), std::size(cases) + 1);
  for (std::size_t i = 0; i < std::size(cases); ++i) {
    auto wrapper = read->attachmentAtIndex(i)->fileWrapper();
    ASSERT_TRUE(wrapper) << cases[i].wanted;
    EXPECT_EQ(wrapper->filename(), cases[i].written);
    EXPECT_EQ(wrapper->regularFileContents(), bytesOf(cases[i].wanted));
  }
  EXPECT_EQ(read->string().back(), u'\uFFFC');
  EXPECT_FALSE(read->attachmentAtIndex(std::size(cases)));
}

TEST(Rtfd, ReadsWhatTheDesktopEditorsWrite) {
  // The shape of a bundle's TXT.rtf as the platform's editors save it: a code page, a
  // font table, the editors' own version control words, a raw 8-bit placeholder and \'xx text.
  std::string rtf =
      "{\\rtf1\\ansi\\ansicpg1252\\cocoartf2639\n"
      "{\\fonttbl\\f0\\fswiss\\fcharset0 Helvetica;}\n{\\colortbl;\\red255\\green255\\blue255;}\n"
      "\\pard\\tx566\\pardirnatural\\partightenfactor0\n\n"
      "\\f0\\fs24 \\cf0 Caf\\'e9 \\'80 \\uc0\\u8364 \\\n"
      "{{\\NeXTGraphic Pasted Graphic.tiff \\width480 \\height320 \\appleattachmentpadding0 "
      "\\appleembedtype0 \\appleaqc\n}\xac}\\\nnext\\'85}";
  auto file = FileWrapper::initRegularFileWithContents(bytesOf("tiff bytes"));
  auto bundle = FileWrapper::initDirectoryWithFileWrappers(
      {{"TXT.rtf", FileWrapper::initRegularFileWithContents(bytesOf(rtf))},
       {"Pasted Graphic.tiff", file}});
  auto read = attributedStringWithRTFDFileWrapper(*bundle);
  ASSERT_TRUE(read);
  EXPECT_EQ(read->string(), u"Caf\u00e9 \u20ac \u20ac\n\uFFFC\nnext\u2026");
  auto attachment = read->attachmentAtIndex(9);
  ASSERT_TRUE(attachment);
  EXPECT_EQ(attachment->fileWrapper(), file);
  EXPECT_EQ(attachment->bounds(), Rect(0, 0, 24, 16));
  EXPECT_FALSE(attachment->contents());
}

TEST(FileWrapper, SerialisedFormReadsThePlatformsMetadataAndLongLengths) {
  // A hand-made serialisation with the platform's metadata entry "." and a long-length
  // file record: the metadata is skipped, the long form read.
  Data flat = bytesOf("rtfd");
  auto word = [&](std::uint32_t v) {
    for (int i = 0; i < 4; ++i) flat.push_back(static_cast<std::uint8_t>(v >> (8 * i)));
  };
  word(0), word(3), word(2);
  word(1), flat.push_back('.');
  word(5), flat.insert(flat.end(), {'x', '.', 't', 'x', 't'});
  word(8 + 1), word(20 + 2);
  word(1), word(1), flat.push_back('m');
  word(1), word(0x80000000u), word(2), word(4), flat.insert(flat.end(), {0, 0, 0, 0, 'h', 'i'});
  auto parsed = FileWrapper::initWithSerializedRepresentation(flat);
  ASSERT_TRUE(parsed);
  ASSERT_EQ(parsed->fileWrappers().size(), 1u);
  EXPECT_EQ(parsed->fileWrappers().at("x.txt")->regularFileContents(), bytesOf("hi"));

  // Directories nest (an attachment may be a package).
  auto tree = FileWrapper::initDirectoryWithFileWrappers(
      {{"sub.rtfd", FileWrapper::initDirectoryWithFileWrappers({{"b", parsed}})}});
  auto back = FileWrapper::initWithSerializedRepresentation(tree->serializedRepresentation());
  ASSERT_TRUE(back);
  auto b = back->fileWrappers().at("sub.rtfd")->fileWrappers().at("b");
  EXPECT_EQ(b->fileWrappers().at("x.txt")->regularFileContents(), bytesOf("hi"));
}

TEST(FileWrapper, ReadsNestedDirectoriesAndWritesOneOverAFileWhole) {
  testing::TempDir dir;
  fs::create_directories(dir.file("pkg/inner"));
  ASSERT_TRUE(writeFileAtomically(dir.file("pkg/a.txt"), bytesOf("a")));
  ASSERT_TRUE(writeFileAtomically(dir.file("pkg/inner/b.txt"), bytesOf("b")));
  ASSERT_TRUE(writeFileAtomically(dir.file("old"), bytesOf("s")));
  auto pkg = FileWrapper::initWithPath(dir.file("pkg"));
  ASSERT_TRUE(pkg);
  ASSERT_TRUE(pkg->writeToPath(dir.file("old")));
  EXPECT_EQ(readFile(dir.file("old/inner/b.txt")), bytesOf("b"));
  EXPECT_EQ(readFile(dir.file("old/a.txt")), bytesOf("a"));
  fs::create_symlink(dir.file("old"), dir.file("link"));
  EXPECT_FALSE(FileWrapper::initWithPath(dir.file("link")));
}

}  // namespace
}  // namespace corvel
