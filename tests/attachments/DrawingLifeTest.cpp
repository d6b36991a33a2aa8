// The whole life of a drawing with real files, the RTFD writer and reader and the
// pasteboard, the test playing the host application around each call.
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "Corvelbase/PencilDrawings.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/RTFD.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

const std::string kFlatRTFD = "com.apple.flat-rtfd";

std::string hex(const Data& data) {
  std::string out;
  for (auto b : data) out += {"0123456789abcdef"[b >> 4], "0123456789abcdef"[b & 15]};
  return out;
}

std::optional<Data> bytesOf(const std::shared_ptr<TextAttachment>& attachment) {
  auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
  return wrapper ? wrapper->regularFileContents() : std::nullopt;
}

class DrawingLife : public ::testing::Test {
 protected:
  // Insert a drawing; returns its identifier.
  std::string insert(AttributedString& text, std::uint64_t at, Size size, const Data& strokes) {
    text.insertImage(testing::makePicture(size.width, size.height), strokes, Range{at, 0});
    auto picture = std::dynamic_pointer_cast<RVMXScaledImageAttachment>(text.attachmentAtIndex(at));
    return picture ? picture->pencilAttachment()->uuid().value_or("") : "";
  }

  // The host's copy or cut: the library's calls around the text system's write.
  void copyOrCut(AttributedString& text, Range selection, bool cut) {
    text.preCutOrCopy(selection);
    PasteboardItem item;
    item.setData(RTFDFromRange(text, selection), kFlatRTFD);
    pasteboard->writeItems({item});
    if (cut) text.deleteCharactersInRange(selection);
    text.postCutOrCopy(selection);
  }

  // The host's paste: the pasteboard's text, then the drawings' item.
  void paste(AttributedString& text, std::uint64_t at) {
    auto pasted = attributedStringWithRTFD(pasteboard->dataForType(kFlatRTFD).value_or(Data{}));
    ASSERT_TRUE(pasted);
    text.insertAttributedString(*pasted, at);
    text.checkForPencilDataOnPaste();
  }

  // The host's save: every picture and drawing writes its own file; the drawings are
  // appended for the write and taken out after it. `kept` are drawings from a load.
  void save(AttributedString& text, const std::string& path, PencilAttachmentDictionary kept = {}) {
    std::vector<std::shared_ptr<RVMXTextAttachment>> own;
    for (std::uint64_t i = 0; i < text.length(); ++i)
      if (auto picture =
              std::dynamic_pointer_cast<RVMXScaledImageAttachment>(text.attachmentAtIndex(i))) {
        own.push_back(picture);
        if (auto drawing = picture->pencilAttachment()) {
          own.push_back(drawing);
          kept[drawing->uuid().value_or("")] = drawing;
        }
      }
    for (const auto& a : own) a->setSaving(kSavingWritingOut);
    Range whole{0, text.length()};
    text.preSaveRTFD(&whole, kept);
    EXPECT_TRUE(writeRTFDToPath(text, path));
    text.postSaveRTFD(whole);
    for (const auto& a : own) a->setSaving(kSavingEditing);
  }

  // The host's load: the text and its drawings by identifier.
  std::pair<AttributedString, PencilAttachmentDictionary> load(const std::string& path) {
    auto text = attributedStringWithContentsOfRTFD(path).value_or(AttributedString(u"unreadable"));
    std::uint64_t length = text.length();
    auto drawings = text.removePencilAttachments();
    text.postLoadDocument();
    EXPECT_EQ(text.length(), length);
    return {text, drawings};
  }

  testing::ScopedCachesDirectory caches;
  testing::ScopedPasteboard pasteboard;
  testing::LogCapture log;
  testing::TempDir documents;
};

TEST_F(DrawingLife, ADrawingComesThroughCopyPasteSaveAndLoadUnchanged) {
  Data strokes = testing::makeStrokes(4096, 5);
  AttributedString text(u"Before  after");
  std::string uuid = insert(text, 7, Size{240, 160}, strokes);
  EXPECT_EQ(caches.names(), (std::set<std::string>{uuid + ".jpeg", uuid + ".pencildata"}));

  // Copy "e <picture> a": the flat RTFD carries <uuid>.jpeg, the drawings' item sits
  // beside it, and the picture is back to editing.
  copyOrCut(text, Range{5, 5}, false);
  EXPECT_EQ(text.attachmentAtIndex(7)->fileWrapper(), nullptr);
  auto items = pasteboard->items();
  ASSERT_EQ(items.size(), 1u);
  EXPECT_EQ(items[0].types(), (std::vector<std::string>{kFlatRTFD, RVPencilPasteboardData}));
  auto flat = FileWrapper::initWithSerializedRepresentation(*items[0].dataForType(kFlatRTFD));
  ASSERT_TRUE(flat && flat->fileWrappers().count(uuid + ".jpeg"));

  // The item reads as the platform's keyed archive to a parser no one here wrote.
  std::string item = documents.file("pencil.archive");
  ASSERT_TRUE(writeFileAtomically(item, *items[0].dataForType(RVPencilPasteboardData)));
  auto reader = testing::runCommand("NODE_PATH='" CORVEL_NODE_MODULES "' node '" CORVEL_SUPPORT_DIR
                                    "/read-keyed-archive.js' '" +
                                    item + "'");
  ASSERT_EQ(reader.status, 0) << reader.output;
  auto json = nlohmann::json::parse(reader.output);
  EXPECT_EQ(json["archiver"], "NSKeyedArchiver");
  EXPECT_EQ(json["rootIsUid"], true);
  EXPECT_EQ(json["entries"], (nlohmann::json{{uuid, hex(strokes)}}));

  // Paste into another text: a plain picture named <uuid>.jpeg, the strokes by <uuid>.
  AttributedString other(u"Pasted: ");
  paste(other, 8);
  ASSERT_EQ(other.string(), u"Pasted: e \uFFFC a");
  EXPECT_EQ(other.fileIDForAttachment(other.attachmentAtIndex(10)), uuid);
  EXPECT_EQ(pastedPencilDataDictionary, (PencilDataDictionary{{uuid, strokes}}));
  EXPECT_EQ(testing::decodedSize(bytesOf(other.attachmentAtIndex(10))), (Size{240, 160}));

  // Save: picture and drawing in the bundle under one identifier; the appended
  // drawing's character stays behind as a plain character.
  std::uint64_t length = text.length();
  save(text, documents.file("Note.rtfd"));
  EXPECT_EQ(testing::ScopedCachesDirectory::namesIn(documents.file("Note.rtfd")),
            (std::set<std::string>{"TXT.rtf", uuid + ".jpeg", uuid + ".pencildata"}));
  EXPECT_EQ(text.length(), length + 1);
  EXPECT_FALSE(text.attachmentAtIndex(length));

  // Load: the drawing by its identifier with the bytes inserted, the picture at its size.
  auto [loaded, drawings] = load(documents.file("Note.rtfd"));
  ASSERT_EQ(drawings.size(), 1u);
  EXPECT_EQ(bytesOf(drawings[uuid]), strokes);
  EXPECT_EQ(loaded.fileIDForAttachment(loaded.attachmentAtIndex(7)), uuid);
  EXPECT_EQ(testing::decodedSize(bytesOf(loaded.attachmentAtIndex(7))), (Size{240, 160}));

  // The kept drawing goes back in at the next save and comes out again unchanged.
  save(loaded, documents.file("Again.rtfd"), drawings);
  EXPECT_EQ(bytesOf(load(documents.file("Again.rtfd")).second[uuid]), strokes);
  EXPECT_TRUE(log.lines().empty());
}

TEST_F(DrawingLife, ACutDrawingPastesElsewhere) {
  Data strokes = testing::makeStrokes(777, 6);
  AttributedString text(u"ab");
  std::string uuid = insert(text, 1, Size{33, 21}, strokes);
  copyOrCut(text, Range{1, 2}, true);
  EXPECT_EQ(text.string(), u"a");
  AttributedString target;
  paste(target, 0);
  ASSERT_EQ(target.string(), u"\uFFFCb");
  EXPECT_EQ(target.fileIDForAttachment(target.attachmentAtIndex(0)), uuid);
  EXPECT_EQ(pastedPencilDataDictionary, (PencilDataDictionary{{uuid, strokes}}));
  EXPECT_EQ(testing::decodedSize(bytesOf(target.attachmentAtIndex(0))), (Size{33, 21}));
}

TEST_F(DrawingLife, TwoDrawingsSaveAndLoadEachWithItsOwnStrokes) {
  Data strokesA = testing::makeStrokes(1000, 7), strokesB = testing::makeStrokes(20000, 8);
  AttributedString text(u"one  two ");
  std::string a = insert(text, 4, Size{50, 40}, strokesA);
  std::string b = insert(text, 10, Size{70, 20}, strokesB);
  save(text, documents.file("Two.rtfd"));
  EXPECT_EQ(testing::ScopedCachesDirectory::namesIn(documents.file("Two.rtfd")),
            (std::set<std::string>{"TXT.rtf", a + ".jpeg", a + ".pencildata", b + ".jpeg",
                                   b + ".pencildata"}));
  auto [loaded, drawings] = load(documents.file("Two.rtfd"));
  ASSERT_EQ(drawings.size(), 2u);
  EXPECT_EQ(bytesOf(drawings[a]), strokesA);
  EXPECT_EQ(bytesOf(drawings[b]), strokesB);
  EXPECT_EQ(loaded.fileIDForAttachment(loaded.attachmentAtIndex(4)), a);
  EXPECT_EQ(loaded.fileIDForAttachment(loaded.attachmentAtIndex(10)), b);
  EXPECT_EQ(testing::decodedSize(bytesOf(loaded.attachmentAtIndex(10))), (Size{70, 20}));
}

}  // namespace
}  // namespace corvel
