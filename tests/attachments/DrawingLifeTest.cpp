// The whole life of drawings with real files, the RTFD writer and reader and the
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
    PencilDrawings::insertImage(text, testing::makePicture(size.width, size.height), strokes,
                                Range{at, 0});
    auto picture = std::dynamic_pointer_cast<RVMXScaledImageAttachment>(text.attachmentAtIndex(at));
    if (!picture) return "";
    own.insert(own.end(), {picture, picture->pencilAttachment()});
    std::string uuid = picture->pencilAttachment()->uuid().value_or("");
    made[uuid] = picture->pencilAttachment();
    return uuid;
  }

  // The host's save: the pictures and drawings it made write their own files; the
  // drawings are appended for the write and taken out after it.
  void save(AttributedString& text, const std::string& path, PencilAttachmentDictionary drawings) {
    for (const auto& a : own) a->setSaving(kSavingWritingOut);
    Range whole{0, text.length()};
    PencilDrawings::preSaveRTFD(text, &whole, drawings);
    EXPECT_TRUE(writeRTFDToPath(text, path));
    PencilDrawings::postSaveRTFD(text, whole);
    for (const auto& a : own) a->setSaving(kSavingEditing);
  }

  // The host's load: the text and its drawings by identifier.
  std::pair<AttributedString, PencilAttachmentDictionary> load(const std::string& path) {
    auto text = attributedStringWithContentsOfRTFD(path).value_or(AttributedString(u"unreadable"));
    std::uint64_t length = text.length();
    auto drawings = PencilDrawings::removePencilAttachments(text);
    PencilDrawings::postLoadDocument(text);
    EXPECT_EQ(text.length(), length);
    return {text, drawings};
  }

  std::vector<std::shared_ptr<RVMXTextAttachment>> own;  // what insert made
  PencilAttachmentDictionary made;                       // its drawings by identifier
  testing::ScopedCachesDirectory caches;
  testing::ScopedPasteboard pasteboard;
  testing::LogCapture log;
  testing::TempDir documents;
};

TEST_F(DrawingLife, DrawingsComeThroughCopyPasteSaveAndLoadUnchanged) {
  Data strokesA = testing::makeStrokes(4096, 5), strokesB = testing::makeStrokes(20000, 8);
  AttributedString text(u"Before  after ");
  std::string a = insert(text, 7, Size{240, 160}, strokesA);
  std::string b = insert(text, 15, Size{70, 20}, strokesB);

  // Copy "e <A> a" as the text system does: the drawings' item sits beside the flat RTFD
  // holding A alone.
  PencilDrawings::preCutOrCopy(text, Range{5, 5});
  PasteboardItem written;
  written.setData(RTFDFromRange(text, Range{5, 5}), kFlatRTFD);
  pasteboard->writeItems({written});
  PencilDrawings::postCutOrCopy(text, Range{5, 5});
  auto items = pasteboard->items();
  ASSERT_EQ(items.size(), 1u);
  EXPECT_EQ(items[0].types(), (std::vector<std::string>{kFlatRTFD, RVPencilPasteboardData}));

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
  EXPECT_EQ(json["entries"], (nlohmann::json{{a, hex(strokesA)}}));

  // Paste into another text: the flat RTFD carried a plain picture named <a>.jpeg, the
  // drawings' item the strokes by <a>.
  AttributedString other(u"Pasted: ");
  auto pasted = attributedStringWithRTFD(*items[0].dataForType(kFlatRTFD));
  ASSERT_TRUE(pasted);
  other.insertAttributedString(*pasted, 8);
  PencilDrawings::checkForPencilDataOnPaste(other);
  ASSERT_EQ(other.string(), u"Pasted: e \uFFFC a");
  EXPECT_EQ(PencilDrawings::fileIDForAttachment(other, other.attachmentAtIndex(10)), a);
  EXPECT_EQ(pastedPencilDataDictionary, (PencilDataDictionary{{a, strokesA}}));
  EXPECT_EQ(testing::decodedSize(bytesOf(other.attachmentAtIndex(10))), (Size{240, 160}));

  // Save: each picture and drawing in the bundle under its own identifier; the appended
  // drawings' characters stay behind as plain characters.
  std::uint64_t length = text.length();
  save(text, documents.file("Note.rtfd"), made);
  EXPECT_EQ(testing::namesIn(documents.file("Note.rtfd")),
            (std::set<std::string>{"TXT.rtf", a + ".jpeg", a + ".pencildata", b + ".jpeg",
                                   b + ".pencildata"}));
  EXPECT_EQ(text.length(), length + 2);
  EXPECT_FALSE(text.attachmentAtIndex(length));

  // Load: each drawing by its identifier, the pictures in place.
  auto [loaded, drawings] = load(documents.file("Note.rtfd"));
  ASSERT_EQ(drawings.size(), 2u);
  EXPECT_EQ(PencilDrawings::fileIDForAttachment(loaded, loaded.attachmentAtIndex(7)), a);
  EXPECT_EQ(PencilDrawings::fileIDForAttachment(loaded, loaded.attachmentAtIndex(15)), b);
  EXPECT_EQ(testing::decodedSize(bytesOf(loaded.attachmentAtIndex(15))), (Size{70, 20}));

  // The kept drawings go back in at the next save and come out again with their own
  // bytes (which they can only do if loading gave them their bytes).
  save(loaded, documents.file("Again.rtfd"), drawings);
  auto again = load(documents.file("Again.rtfd")).second;
  EXPECT_EQ(bytesOf(again[a]), strokesA);
  EXPECT_EQ(bytesOf(again[b]), strokesB);
  EXPECT_TRUE(log.lines().empty());
}

}  // namespace
}  // namespace corvel
