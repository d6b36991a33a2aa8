#include <gtest/gtest.h>

#include "Corvelbase/PencilDrawings.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

using testing::namedAttachment;

std::shared_ptr<RVMXScaledImageAttachment> pictureAt(const AttributedString& text,
                                                     std::uint64_t index) {
  return std::dynamic_pointer_cast<RVMXScaledImageAttachment>(text.attachmentAtIndex(index));
}

AttributedString textOf(std::initializer_list<std::shared_ptr<TextAttachment>> attachments) {
  AttributedString text(u"<");
  for (const auto& a : attachments) {
    text.appendAttributedString(AttributedString::attributedStringWithAttachment(a));
    text.appendAttributedString(AttributedString(u" "));
  }
  return text;
}

TEST(PencilDrawings, CutAndCopyWriteOnlyWhatTheyHoldAndResetOnlyInsideTheText) {
  testing::ScopedCachesDirectory caches;
  testing::ScopedPasteboard pasteboard;
  testing::LogCapture log;
  AttributedString text(u"abc");
  text.insertImage(testing::makePicture(8, 8), Data{3}, Range{1, 0});
  text.insertImage(testing::makePicture(8, 8), Data{4}, Range{4, 0});
  text.insertImage(testing::makePicture(8, 8), Data{5}, Range{9, 9});  // outside: nothing
  ASSERT_EQ(text.string(), u"a\uFFFCbc\uFFFC");
  EXPECT_EQ(caches.names().size(), 4u);
  auto cut = pictureAt(text, 1), exported = pictureAt(text, 4);

  // While editing the pictures give no file, so no drawing can be keyed by it.
  EXPECT_TRUE(text.pencilDataDictionaryForRange(Range{0, 5}).empty());
  // A copy without drawings writes nothing and says nothing.
  text.preCutOrCopy(Range{2, 2});
  text.postCutOrCopy(Range{2, 2});
  EXPECT_EQ(pasteboard->changeCount(), 0);

  // A cut past the new end still writes the item and clears the dictionary, but resets
  // nothing: not the cut picture, nor one that the shorter text has moved into range.
  exported->setSaving(kSavingTextExport);
  text.preCutOrCopy(Range{1, 3});
  EXPECT_EQ(pencilDataDict, (PencilDataDictionary{{*cut->pencilAttachment()->uuid(), {3}}}));
  text.deleteCharactersInRange(Range{1, 3});
  text.postCutOrCopy(Range{1, 3});
  EXPECT_TRUE(pasteboard->dataForType(RVPencilPasteboardData));
  EXPECT_FALSE(pencilDataDict);
  EXPECT_EQ(cut->saving(), kSavingWritingOut);
  EXPECT_EQ(exported->saving(), kSavingTextExport);
  // An end that wraps past 2^64 lies past the end too; a range inside resets.
  text.postCutOrCopy(Range{1, ~std::uint64_t{0}});
  EXPECT_EQ(exported->saving(), kSavingTextExport);
  text.postCutOrCopy(Range{1, 1});
  EXPECT_EQ(exported->saving(), kSavingEditing);
  EXPECT_TRUE(log.lines().empty());
}

TEST(PencilDrawings, TheTwoIdentifiersDifferOnPreferredFilename) {
  struct Case {
    std::shared_ptr<TextAttachment> attachment;
    std::optional<std::string> identifier, fileID;
  } cases[] = {
      {namedAttachment("P.jpeg", "F.jpeg"), "P", "F"},
      {namedAttachment(std::nullopt, "F.jpeg"), "F", "F"},
      {namedAttachment("P.jpeg", std::nullopt), "P", std::nullopt},
      {namedAttachment(std::nullopt, std::nullopt), std::nullopt, std::nullopt},
      {namedAttachment("a/b/Q.tar.gz", "/x/R.pencildata/"), "Q.tar", "R"},
      {namedAttachment(".hidden", "noext"), ".hidden", "noext"},
      {TextAttachment::init(), std::nullopt, std::nullopt},
      {nullptr, std::nullopt, std::nullopt},
  };
  AttributedString text;
  for (std::size_t i = 0; i < std::size(cases); ++i) {
    EXPECT_EQ(text.identifierForAttachment(cases[i].attachment), cases[i].identifier) << i;
    EXPECT_EQ(text.fileIDForAttachment(cases[i].attachment), cases[i].fileID) << i;
  }
}

TEST(PencilDrawings, SavingAppendsInTextOrderAndRemovingLeavesTheCharacters) {
  auto one = namedAttachment(std::nullopt, "ONE.jpeg"), two = namedAttachment("TWO.jpeg", "x");
  auto drawingOne = namedAttachment(std::nullopt, "ONE.pencildata");
  auto drawingTwo = namedAttachment("TWO.pencildata", "other.bin");  // preferred name first
  auto viaFilename = namedAttachment("t.jpeg", "T.pencildata");      // failing that, filename
  auto upper = namedAttachment(std::nullopt, "u.PENCILDATA");        // case matters
  auto text = textOf({two, one, viaFilename, upper, TextAttachment::init(), two, nullptr});
  const AttributedString original = text;

  // No dictionary, an empty one, keys matching nothing, the form without a dictionary:
  // nothing changes, and the range is never touched.
  Range range{123, 456};
  text.preSaveRTFD(&range);
  text.preSaveRTFD(nullptr, PencilAttachmentDictionary{});
  text.preSaveRTFD(&range, PencilAttachmentDictionary{{"NONE", drawingOne}, {"ONE", nullptr}});
  text.appendPencilAttachments(std::nullopt);
  EXPECT_EQ(text, original);
  EXPECT_EQ(range, (Range{123, 456}));

  text.preSaveRTFD(&range, PencilAttachmentDictionary{{"ONE", drawingOne}, {"TWO", drawingTwo}});
  std::uint64_t end = original.length();
  ASSERT_EQ(text.length(), end + 3);
  EXPECT_EQ(text.attachmentAtIndex(end), drawingTwo);
  EXPECT_EQ(text.attachmentAtIndex(end + 1), drawingOne);
  EXPECT_EQ(text.attachmentAtIndex(end + 2), drawingTwo);  // its picture stands twice

  auto taken = text.removePencilAttachments();
  EXPECT_EQ(taken, (PencilAttachmentDictionary{
                       {"ONE", drawingOne}, {"TWO", drawingTwo}, {"t", viaFilename}}));
  EXPECT_EQ(text.length(), end + 3);  // the characters stay, without their attachments
  EXPECT_EQ(text.string()[5], AttachmentCharacter);
  EXPECT_FALSE(text.attachmentAtIndex(5));
  EXPECT_FALSE(text.attachmentAtIndex(end));
  EXPECT_EQ(text.attachmentAtIndex(7), upper);
  text.postSaveRTFD(range);  // nothing is left to take
  EXPECT_EQ(text.attachmentAtIndex(7), upper);
  text.postLoadDocument();
  EXPECT_EQ(text.length(), end + 3);
}

}  // namespace
}  // namespace corvel
