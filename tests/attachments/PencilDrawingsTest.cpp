#include <gtest/gtest.h>

#include "Corvelbase/PencilDrawings.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/KeyedArchive.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

using testing::ScopedCachesDirectory;
using testing::ScopedPasteboard;

std::shared_ptr<RVMXScaledImageAttachment> pictureAt(const AttributedString& text,
                                                     std::uint64_t index) {
  return std::dynamic_pointer_cast<RVMXScaledImageAttachment>(text.attachmentAtIndex(index));
}

// A plain attachment whose wrapper has the given names, as a loaded text holds them.
std::shared_ptr<TextAttachment> namedAttachment(std::optional<std::string> preferred,
                                                std::optional<std::string> filename,
                                                Data bytes = {}) {
  auto wrapper = FileWrapper::initRegularFileWithContents(std::move(bytes));
  wrapper->setPreferredFilename(std::move(preferred));
  wrapper->setFilename(std::move(filename));
  return TextAttachment::initWithFileWrapper(wrapper);
}

AttributedString textOf(std::initializer_list<std::shared_ptr<TextAttachment>> attachments) {
  AttributedString text(u"<");
  for (const auto& a : attachments) {
    text.appendAttributedString(AttributedString::attributedStringWithAttachment(a));
    text.appendAttributedString(AttributedString(u" "));
  }
  return text;
}

TEST(PencilDrawings, InsertingADrawingWritesBothFilesUnderOneIdentifier) {
  ScopedCachesDirectory caches;
  Data strokes = testing::makeStrokes(500, 3);
  AttributedString text(u"ab");
  text.insertImage(testing::makePicture(40, 30), strokes, Range{1, 0});
  ASSERT_EQ(text.string(), u"a\uFFFCb");
  EXPECT_FALSE(text.isEditing());
  auto picture = pictureAt(text, 1);
  ASSERT_TRUE(picture && picture->pencilAttachment());
  const auto& drawing = picture->pencilAttachment();
  ASSERT_TRUE(drawing->uuid());
  std::string uuid = *drawing->uuid();
  EXPECT_EQ(caches.names(), (std::set<std::string>{uuid + ".jpeg", uuid + ".pencildata"}));
  EXPECT_EQ(readFile(caches.file(uuid + ".pencildata")), strokes);
  EXPECT_EQ(readFile(caches.file(uuid + ".jpeg")), picture->contents());
  EXPECT_EQ(picture->saving(), 0);
  EXPECT_EQ(drawing->saving(), 0);
  EXPECT_FALSE(drawing->fileWrapper());  // no file offered while editing

  // Replacing a selection, and a selection outside the text, which changes nothing.
  text.insertImage(testing::makePicture(4, 4), Data{1}, Range{0, 1});
  EXPECT_EQ(text.string(), u"\uFFFC\uFFFCb");
  text.insertImage(testing::makePicture(4, 4), Data{1}, Range{2, 5});
  text.insertImage(testing::makePicture(4, 4), Data{1}, Range{NotFound, 0});
  EXPECT_EQ(text.string(), u"\uFFFC\uFFFCb");
  EXPECT_EQ(caches.names().size(), 4u);
}

TEST(PencilDrawings, PencilDataOfARangeIsKeyedByThePicturesOwnFile) {
  ScopedCachesDirectory caches;
  AttributedString text(u"0123");
  text.insertImage(testing::makePicture(8, 8), Data{1, 1}, Range{1, 0});
  text.insertImage(testing::makePicture(8, 8), Data{2, 2}, Range{3, 0});
  text.insertImage(testing::makePicture(8, 8), std::nullopt, Range{5, 0});  // no strokes
  auto plain = RVMXScaledImageAttachment::initWithImage(testing::makePicture(8, 8), nullptr);
  text.appendAttributedString(AttributedString::attributedStringWithAttachment(plain));
  ASSERT_EQ(text.length(), 8u);
  std::string first = *pictureAt(text, 1)->pencilAttachment()->uuid();
  std::string second = *pictureAt(text, 3)->pencilAttachment()->uuid();

  // While editing the pictures give no file of their own, so nothing can be keyed.
  EXPECT_TRUE(text.pencilDataDictionaryForRange(Range{0, 8}).empty());
  text.preCutOrCopy(Range{0, 8});
  struct Case {
    Range range;
    PencilDataDictionary expected;
  } cases[] = {
      {{0, 8}, {{first, {1, 1}}, {second, {2, 2}}}},
      {{0, 2}, {{first, {1, 1}}}},
      {{2, 1}, {}},
      {{3, 100}, {{second, {2, 2}}}},  // clamped
      {{5, 3}, {}},                    // no strokes; a plain picture
      {{NotFound, 4}, {}},
  };
  for (const auto& c : cases)
    EXPECT_EQ(text.pencilDataDictionaryForRange(c.range), c.expected)
        << c.range.location << "," << c.range.length;
  text.postCutOrCopy(Range{0, 8});

  // Two pictures of one name: the later entry wins, and one without strokes removes it.
  auto same = [&](std::optional<Data> strokes) {
    auto picture = RVMXScaledImageAttachment::initWithImage(
        testing::makePicture(4, 4), RVPencilAttachment::initWithData(strokes, "public.data"));
    auto wrapper = FileWrapper::initRegularFileWithContents({});
    wrapper->setFilename("dir/S.jpeg");
    picture->setFw(wrapper);
    picture->setSaving(kSavingWritingOut);
    return picture;
  };
  auto twice = textOf({same(Data{1}), same(Data{2})});
  EXPECT_EQ(twice.pencilDataDictionaryForRange(Range{0, twice.length()}),
            (PencilDataDictionary{{"S", {2}}}));
  auto removed = textOf({same(Data{1}), same(std::nullopt)});
  EXPECT_TRUE(removed.pencilDataDictionaryForRange(Range{0, removed.length()}).empty());
}

TEST(PencilDrawings, CopyPutsTheDrawingsBesideTheTextAndRestoresEditing) {
  ScopedCachesDirectory caches;
  ScopedPasteboard pasteboard;
  testing::LogCapture log;
  AttributedString text(u"x y z");
  text.insertImage(testing::makePicture(8, 8), Data{7, 7, 7}, Range{1, 1});
  text.insertImage(testing::makePicture(8, 8), Data{8}, Range{3, 1});
  auto inside = pictureAt(text, 1), outside = pictureAt(text, 3);
  std::string uuid = *inside->pencilAttachment()->uuid();

  PasteboardItem rich;
  rich.setData(Data{'r'}, "com.apple.flat-rtfd");
  pasteboard->writeItems({rich});
  text.preCutOrCopy(Range{0, 2});
  EXPECT_EQ(inside->saving(), kSavingWritingOut);
  EXPECT_EQ(outside->saving(), kSavingEditing);
  EXPECT_EQ(pencilDataDict, (PencilDataDictionary{{uuid, {7, 7, 7}}}));
  text.postCutOrCopy(Range{0, 2});
  EXPECT_EQ(inside->saving(), kSavingEditing);
  EXPECT_FALSE(pencilDataDict);
  auto items = pasteboard->items();
  ASSERT_EQ(items.size(), 1u);
  EXPECT_EQ(items[0].types(),
            (std::vector<std::string>{"com.apple.flat-rtfd", "com.corvelwrks.pencildata"}));
  auto item = pasteboard->dataForType(RVPencilPasteboardData);
  ASSERT_TRUE(item);
  EXPECT_EQ(KeyedArchive::unarchiveDictionary(*item), (PencilDataDictionary{{uuid, {7, 7, 7}}}));

  // A copy without drawings writes nothing and says nothing.
  std::int64_t count = pasteboard->changeCount();
  text.preCutOrCopy(Range{4, 1});
  text.postCutOrCopy(Range{4, 1});
  EXPECT_EQ(pasteboard->changeCount(), count);
  text.addPencilDataToClipboard(std::nullopt);
  text.addPencilDataToClipboard(PencilDataDictionary{});
  EXPECT_EQ(pasteboard->changeCount(), count);
  EXPECT_TRUE(log.lines().empty());
}

TEST(PencilDrawings, ACutPastTheNewEndStillWritesButKeepsSaving) {
  ScopedCachesDirectory caches;
  ScopedPasteboard pasteboard;
  AttributedString text(u"abcd");
  text.insertImage(testing::makePicture(8, 8), Data{3}, Range{2, 0});
  auto picture = pictureAt(text, 2);
  Range selection{1, 3};
  text.preCutOrCopy(selection);
  text.deleteCharactersInRange(selection);
  ASSERT_EQ(text.string(), u"ad");
  text.postCutOrCopy(selection);
  EXPECT_TRUE(pasteboard->dataForType(RVPencilPasteboardData));
  EXPECT_EQ(picture->saving(), kSavingWritingOut);  // accepted: not reset by a clamped range
  EXPECT_FALSE(pencilDataDict);

  // A range whose end wraps past 2^64 is past the end too, not inside the text.
  AttributedString again(u"a");
  again.insertImage(testing::makePicture(8, 8), Data{4}, Range{0, 0});
  auto kept = pictureAt(again, 0);
  again.preCutOrCopy(Range{0, 1});
  again.postCutOrCopy(Range{1, ~std::uint64_t{0}});
  EXPECT_EQ(kept->saving(), kSavingWritingOut);
}

TEST(PencilDrawings, PasteReadsTheItemOrForgetsWhatItCannotRead) {
  ScopedPasteboard pasteboard;
  AttributedString text;
  pastedPencilDataDictionary = PencilDataDictionary{{"old", {1}}};
  text.checkForPencilDataOnPaste();  // no item: what was there stays
  EXPECT_EQ(pastedPencilDataDictionary, (PencilDataDictionary{{"old", {1}}}));
  PencilDataDictionary strokes{{"A", {1, 2}}, {"B", {}}};
  text.addPencilDataToClipboard(strokes);
  text.checkForPencilDataOnPaste();
  EXPECT_EQ(pastedPencilDataDictionary, strokes);
  pasteboard->setData(Data{'x'}, RVPencilPasteboardData);
  text.checkForPencilDataOnPaste();
  EXPECT_FALSE(pastedPencilDataDictionary);
}

TEST(PencilDrawings, TheTwoIdentifiersDifferOnPreferredFilename) {
  struct Case {
    const char* name;
    std::shared_ptr<TextAttachment> attachment;
    std::optional<std::string> identifier;
    std::optional<std::string> fileID;
  } cases[] = {
      {"both names", namedAttachment("P.jpeg", "F.jpeg"), "P", "F"},
      {"filename only", namedAttachment(std::nullopt, "F.jpeg"), "F", "F"},
      {"preferred only", namedAttachment("P.jpeg", std::nullopt), "P", std::nullopt},
      {"no names", namedAttachment(std::nullopt, std::nullopt), std::nullopt, std::nullopt},
      {"no wrapper", TextAttachment::init(), std::nullopt, std::nullopt},
      {"no attachment", nullptr, std::nullopt, std::nullopt},
      {"paths and dots", namedAttachment("a/b/Q.tar.gz", "/x/R.pencildata/"), "Q.tar", "R"},
      {"hidden or bare", namedAttachment(".hidden", "noext"), ".hidden", "noext"},
      {"empty name", namedAttachment("", "F.jpeg"), "", "F"},
  };
  AttributedString text;
  for (const auto& c : cases) {
    EXPECT_EQ(text.identifierForAttachment(c.attachment), c.identifier) << c.name;
    EXPECT_EQ(text.fileIDForAttachment(c.attachment), c.fileID) << c.name;
  }
}

TEST(PencilDrawings, RemovingDrawingsLeavesTheirCharacters) {
  auto a = namedAttachment(std::nullopt, "A.pencildata", {1});
  auto b = namedAttachment("B.pencildata", "other.bin", {2});  // the preferred name decides
  auto c = namedAttachment("c.jpeg", "C.pencildata", {3});     // failing that, the filename
  auto upper = namedAttachment(std::nullopt, "u.PENCILDATA");  // case matters here
  auto hidden = namedAttachment(std::nullopt, ".pencildata");  // no extension at all
  auto picture = namedAttachment(std::nullopt, "A.jpeg");
  auto text = textOf({picture, a, b, c, upper, hidden, TextAttachment::init(), nullptr});
  std::uint64_t length = text.length();
  auto drawings = text.removePencilAttachments();
  EXPECT_EQ(drawings, (PencilAttachmentDictionary{{"A", a}, {"B", b}, {"c", c}}));
  EXPECT_EQ(text.length(), length);
  EXPECT_EQ(text.string()[3], AttachmentCharacter);
  std::vector<std::shared_ptr<TextAttachment>> left;
  for (std::uint64_t i = 0; i < text.length(); ++i)
    if (auto attachment = text.attachmentAtIndex(i)) left.push_back(attachment);
  EXPECT_EQ(left.size(), 4u);
  EXPECT_EQ(left[0], picture);
  EXPECT_EQ(left[1], upper);
  EXPECT_EQ(left[2], hidden);
  EXPECT_TRUE(upper->isPencilData() == false);  // a plain attachment is never pencil data
  // Once out, nothing more comes out.
  EXPECT_TRUE(text.removePencilAttachments().empty());
  EXPECT_TRUE(AttributedString().removePencilAttachments().empty());
}

TEST(PencilDrawings, AppendingForASaveFollowsTheTextOrder) {
  auto first = namedAttachment(std::nullopt, "ONE.jpeg");
  auto second = namedAttachment("TWO.jpeg", "ignored.jpeg");
  auto drawingOne = namedAttachment(std::nullopt, "ONE.pencildata");
  auto drawingTwo = namedAttachment(std::nullopt, "TWO.pencildata");
  PencilAttachmentDictionary drawings{{"ONE", drawingOne}, {"TWO", drawingTwo}};
  auto text = textOf({second, first, TextAttachment::init(), second});
  AttributedString original = text;

  // Nothing happens without a dictionary, with an empty one, with keys matching nothing,
  // or through the form without a dictionary; the range is never touched.
  Range range{123, 456};
  text.preSaveRTFD(&range);
  text.preSaveRTFD(nullptr);
  text.preSaveRTFD(&range, std::nullopt);
  text.preSaveRTFD(&range, PencilAttachmentDictionary{});
  text.preSaveRTFD(&range, PencilAttachmentDictionary{{"NONE", drawingOne}, {"TWO.jpeg", nullptr}});
  text.appendPencilAttachments(std::nullopt);
  EXPECT_EQ(text, original);
  EXPECT_EQ(range, (Range{123, 456}));

  text.preSaveRTFD(&range, drawings);
  ASSERT_EQ(text.length(), original.length() + 3);
  std::uint64_t end = original.length();
  EXPECT_EQ(text.attachmentAtIndex(end), drawingTwo);
  EXPECT_EQ(text.attachmentAtIndex(end + 1), drawingOne);
  EXPECT_EQ(text.attachmentAtIndex(end + 2), drawingTwo);  // its picture stands twice

  text.postSaveRTFD(range);
  EXPECT_EQ(text.length(), original.length() + 3);  // the characters stay
  for (std::uint64_t i = end; i < text.length(); ++i) EXPECT_FALSE(text.attachmentAtIndex(i));
  EXPECT_EQ(text.attributedSubstringFromRange(Range{0, end}), original);
  text.postLoadDocument();
  EXPECT_EQ(text.length(), original.length() + 3);
}

}  // namespace
}  // namespace corvel
