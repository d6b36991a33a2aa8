#include <gtest/gtest.h>

#include <regex>

#include "Corvelbase/PencilDrawings.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/KeyedArchive.h"
#include "Corvelbase/platform/RTFD.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

std::shared_ptr<RVMXScaledImageAttachment> pictureAt(const AttributedString& text,
                                                     std::uint64_t index) {
  return std::dynamic_pointer_cast<RVMXScaledImageAttachment>(text.attachmentAtIndex(index));
}

using Attachment = std::shared_ptr<TextAttachment>;

Attachment named(std::optional<std::string> preferred, std::optional<std::string> filename) {
  return TextAttachment::initWithFileWrapper(testing::wrapperNamed(filename, preferred));
}

TEST(PencilAttachment, WritesItsBytesUnderAFreshUUIDAndHandsOutWhatSavingAsks) {
  testing::ScopedCachesDirectory caches;
  Data strokes = testing::makeStrokes(3000, 1);
  auto drawing = RVPencilAttachment::initWithData(strokes, "public.data");
  ASSERT_TRUE(drawing->uuid());
  EXPECT_TRUE(
      std::regex_match(*drawing->uuid(), std::regex("[0-9A-F]{8}(-[0-9A-F]{4}){3}-[0-9A-F]{12}")));
  EXPECT_EQ(readFile(caches.file(*drawing->uuid() + ".pencildata")), strokes);  // as given
  // Without data there is nothing to name or write.
  auto empty = RVPencilAttachment::initWithData(std::nullopt, "public.data");
  EXPECT_FALSE(empty->uuid() || empty->fw() || empty->strokeData());
  EXPECT_EQ(caches.names().size(), 1u);

  // Made with any type, a drawing is plain data.
  drawing = RVPencilAttachment::initWithData(strokes, "com.example.ink");
  const std::pair<std::int64_t, bool> cases[] = {
      {0, false}, {1, true}, {2, false}, {-1, false}};  // saving, writing out
  for (const auto& [saving, writingOut] : cases) {
    drawing->setSaving(saving);
    // The file only while written out, the contents only while not: never both.
    EXPECT_EQ(drawing->fileWrapper(), writingOut ? drawing->fw() : nullptr) << saving;
    EXPECT_EQ(drawing->contents(), writingOut ? std::nullopt : std::optional<Data>(strokes));
    EXPECT_EQ(drawing->isPencilData(), writingOut) << saving;
    // The strokes and the type never depend on the state or the creation.
    EXPECT_EQ(drawing->strokeData(), strokes) << saving;
    EXPECT_EQ(drawing->fileType(), "public.data") << saving;
  }
}

TEST(PencilDrawings, CutAndCopyWriteOnlyWhatTheyHoldAndResetOnlyInsideTheText) {
  testing::ScopedCachesDirectory caches;
  testing::ScopedPasteboard pasteboard;
  testing::LogCapture log;
  AttributedString text(u"abc");
  PencilDrawings::insertImage(text, testing::makePicture(8, 8), Data{3}, Range{1, 0});
  PencilDrawings::insertImage(text, testing::makePicture(8, 8), Data{4}, Range{4, 0});
  PencilDrawings::insertImage(text, testing::makePicture(8, 8), Data{5},
                              Range{9, 9});  // outside: nothing
  ASSERT_EQ(text.string(), u"a\uFFFCbc\uFFFC");
  auto cut = pictureAt(text, 1), exported = pictureAt(text, 4);

  // While editing the pictures give no file, so no drawing can be keyed by it.
  EXPECT_TRUE(PencilDrawings::pencilDataDictionaryForRange(text, Range{0, 5}).empty());
  // A copy without drawings writes nothing and says nothing.
  PencilDrawings::preCutOrCopy(text, Range{2, 2});
  PencilDrawings::postCutOrCopy(text, Range{2, 2});
  EXPECT_EQ(pasteboard->changeCount(), 0);

  // A cut past the new end still writes the item and clears the dictionary, but resets
  // nothing: not the cut picture, nor one that the shorter text has moved into range.
  exported->setSaving(kSavingTextExport);
  PencilDrawings::preCutOrCopy(text, Range{1, 3});
  EXPECT_EQ(pencilDataDict, (PencilDataDictionary{{*cut->pencilAttachment()->uuid(), {3}}}));
  text.deleteCharactersInRange(Range{1, 3});
  PencilDrawings::postCutOrCopy(text, Range{1, 3});
  EXPECT_TRUE(pasteboard->dataForType(RVPencilPasteboardData));
  EXPECT_FALSE(pencilDataDict);
  EXPECT_EQ(cut->saving(), kSavingWritingOut);
  EXPECT_EQ(exported->saving(), kSavingTextExport);
  // An end that wraps past 2^64 lies past the end too; a range inside resets.
  PencilDrawings::postCutOrCopy(text, Range{1, ~std::uint64_t{0}});
  EXPECT_EQ(exported->saving(), kSavingTextExport);
  PencilDrawings::postCutOrCopy(text, Range{1, 1});
  EXPECT_EQ(exported->saving(), kSavingEditing);
  EXPECT_TRUE(log.lines().empty());
}

TEST(PencilDrawings, TheTwoIdentifiersDifferOnPreferredFilename) {
  struct Case {
    Attachment attachment;
    std::optional<std::string> identifier, fileID;
  } cases[] = {
      {named("P.jpeg", "F.jpeg"), "P", "F"},
      {named(std::nullopt, "F.jpeg"), "F", "F"},
      {named("P.jpeg", std::nullopt), "P", std::nullopt},
      {named("a/b/Q.tar.gz", "/x/R.pencildata/"), "Q.tar", "R"},
      {named(".hidden", "noext"), ".hidden", "noext"},
      {TextAttachment::init(), std::nullopt, std::nullopt},  // no wrapper
      {nullptr, std::nullopt, std::nullopt},
  };
  AttributedString text;
  for (std::size_t i = 0; i < std::size(cases); ++i) {
    EXPECT_EQ(PencilDrawings::identifierForAttachment(text, cases[i].attachment),
              cases[i].identifier)
        << i;
    EXPECT_EQ(PencilDrawings::fileIDForAttachment(text, cases[i].attachment), cases[i].fileID) << i;
  }
}

TEST(PencilDrawings, SavingAppendsInTextOrderAndRemovingLeavesTheCharacters) {
  auto one = named(std::nullopt, "ONE.jpeg"), two = named("TWO.jpeg", "x");
  auto drawingOne = named(std::nullopt, "ONE.pencildata");
  auto drawingTwo = named("TWO.pencildata", "other.bin");  // preferred name first
  auto viaFilename = named("t.jpeg", "T.pencildata");      // failing that, filename
  auto upper = named(std::nullopt, "u.PENCILDATA");        // case matters
  AttributedString text(u"<");
  for (const auto& a : {two, one, viaFilename, upper, TextAttachment::init(), two, Attachment()})
    text.appendAttributedString(AttributedString::attributedStringWithAttachment(a));
  const AttributedString original = text;

  // No dictionary, an empty one, keys matching nothing or a null drawing, the form
  // without a dictionary: nothing changes, and the range is never touched.
  Range range{123, 456};
  PencilDrawings::preSaveRTFD(text, &range);
  PencilDrawings::preSaveRTFD(text, nullptr, PencilAttachmentDictionary{});
  PencilDrawings::preSaveRTFD(text, &range,
                              PencilAttachmentDictionary{{"NONE", drawingOne}, {"ONE", nullptr}});
  PencilDrawings::appendPencilAttachments(text, std::nullopt);
  EXPECT_EQ(text, original);
  EXPECT_EQ(range, (Range{123, 456}));

  PencilDrawings::preSaveRTFD(text, &range,
                              PencilAttachmentDictionary{{"ONE", drawingOne}, {"TWO", drawingTwo}});
  std::uint64_t end = original.length();
  ASSERT_EQ(text.length(), end + 3);
  EXPECT_EQ(text.attachmentAtIndex(end), drawingTwo);
  EXPECT_EQ(text.attachmentAtIndex(end + 1), drawingOne);
  EXPECT_EQ(text.attachmentAtIndex(end + 2), drawingTwo);  // its picture stands twice

  EXPECT_EQ(
      PencilDrawings::removePencilAttachments(text),
      (PencilAttachmentDictionary{{"ONE", drawingOne}, {"TWO", drawingTwo}, {"t", viaFilename}}));
  EXPECT_EQ(text.length(), end + 3);  // the characters stay, without their attachments
  EXPECT_EQ(text.string()[3], AttachmentCharacter);
  for (std::uint64_t i : {std::uint64_t{3}, end, end + 2})
    EXPECT_FALSE(text.attachmentAtIndex(i)) << i;
  EXPECT_EQ(text.attachmentAtIndex(4), upper);
}

// ---- Pasteboard items and bundles that no well-behaved program writes ----

// The archive reader's own tests go through every malformed archive; here, that an item
// it refuses reaches the host as "no drawings", silently, and none leaves the last alone.
TEST(PencilDrawingsHostile, PasteboardItemsThatAreNoDrawingsAreDroppedSilently) {
  testing::ScopedPasteboard pasteboard;
  testing::LogCapture log;
  Data truncated = *KeyedArchive::archiveDictionary({{"K", {1, 2}}});
  truncated.resize(truncated.size() - 5);
  Data huge(4u << 20, 0xFF);  // 4 MB that claims to be a binary property list
  std::copy_n("bplist00", 8, huge.begin());
  AttributedString text;
  for (const Data* item : {&truncated, &huge}) {
    pastedPencilDataDictionary = PencilDataDictionary{{"before", {0}}};
    ASSERT_TRUE(pasteboard->setData(*item, RVPencilPasteboardData));
    PencilDrawings::checkForPencilDataOnPaste(text);
    EXPECT_FALSE(pastedPencilDataDictionary) << item->size();
  }
  pasteboard->clearContents();
  pastedPencilDataDictionary = PencilDataDictionary{};
  PencilDrawings::checkForPencilDataOnPaste(text);
  EXPECT_EQ(pastedPencilDataDictionary, PencilDataDictionary{});
  EXPECT_TRUE(log.lines().empty());
}

// One bundle with every odd case: a drawing named but missing (as any name leading out
// of the bundle or through a link ends: the bundle reader gives it no wrapper), a folder
// named as a drawing (taken by its name, though it holds no strokes), and a drawing named
// twice. Nothing but the drawings loses its attachment, and no character goes.
TEST(PencilDrawingsHostile, BundlesGiveOnlyTheDrawingsTheyReallyHold) {
  testing::TempDir dir;
  std::string bundle = dir.file("doc.rtfd");
  std::filesystem::create_directories(bundle + "/D.pencildata/inner");
  ASSERT_TRUE(writeFileAtomically(bundle + "/A.jpeg", Data{6}));
  ASSERT_TRUE(writeFileAtomically(bundle + "/A.pencildata", Data{7}));
  ASSERT_TRUE(writeFileAtomically(bundle + "/S.pencildata", Data{8}));
  std::string rtf = "{\\rtf1\\ansi\\ansicpg1252 text";
  for (const char* name :
       {"A.jpeg", "A.pencildata", "M.pencildata", "D.pencildata", "S.pencildata", "S.pencildata"})
    rtf += std::string("{{\\NeXTGraphic ") + name + " \\width20 \\height20\n}\\'ac}";
  ASSERT_TRUE(writeFileAtomically(bundle + "/TXT.rtf", Data(rtf.begin(), rtf.end())));
  auto text = attributedStringWithContentsOfRTFD(bundle);
  ASSERT_TRUE(text);
  std::uint64_t length = text->length();
  PencilDataDictionary found;
  for (const auto& [identifier, attachment] : PencilDrawings::removePencilAttachments(*text))
    found[identifier] = attachment->fileWrapper()->regularFileContents().value_or(Data{});
  EXPECT_EQ(found, (PencilDataDictionary{{"A", {7}}, {"D", {}}, {"S", {8}}}));
  EXPECT_EQ(text->length(), length);
  std::vector<std::optional<std::string>> left;
  for (std::uint64_t i = 0; i < length; ++i)
    if (auto attachment = text->attachmentAtIndex(i))
      left.push_back(PencilDrawings::fileIDForAttachment(*text, attachment));
  EXPECT_EQ(left, (std::vector<std::optional<std::string>>{"A", std::nullopt}));
}

}  // namespace
}  // namespace corvel
