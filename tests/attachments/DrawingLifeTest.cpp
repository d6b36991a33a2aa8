// The whole life of a drawing, with real files, the RTFD writer and reader, and the
// pasteboard, the test playing the host application around each call.
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <filesystem>

#include "Corvelbase/PencilDrawings.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/RTFD.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

const std::string kFlatRTFDType = "com.apple.flat-rtfd";

std::string hex(const Data& data) {
  static const char digits[] = "0123456789abcdef";
  std::string out;
  for (auto b : data) out += {digits[b >> 4], digits[b & 15]};
  return out;
}

std::set<std::string> namesIn(const std::string& directory) {
  std::set<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(directory))
    names.insert(entry.path().filename().string());
  return names;
}

Size decodedSize(const std::shared_ptr<TextAttachment>& attachment) {
  auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
  auto bytes = wrapper ? wrapper->regularFileContents() : std::nullopt;
  auto image = bytes ? Image::initWithData(*bytes) : nullptr;
  return image ? image->size() : Size{};
}

class DrawingLife : public ::testing::Test {
 protected:
  std::shared_ptr<RVMXScaledImageAttachment> pictureAt(const AttributedString& text,
                                                       std::uint64_t index) {
    return std::dynamic_pointer_cast<RVMXScaledImageAttachment>(text.attachmentAtIndex(index));
  }

  // What the host does for a copy or a cut: the library's calls around the text system
  // writing the selection to the pasteboard as flat RTFD.
  void copyOrCut(AttributedString& text, Range selection, bool cut) {
    text.preCutOrCopy(selection);
    PasteboardItem item;
    item.setData(RTFDFromRange(text, selection), kFlatRTFDType);
    pasteboard->writeItems({item});
    if (cut) text.deleteCharactersInRange(selection);
    text.postCutOrCopy(selection);
  }

  // What the host does for a paste: insert the pasteboard's text, then read the drawings.
  void paste(AttributedString& text, std::uint64_t location) {
    auto flat = pasteboard->dataForType(kFlatRTFDType);
    ASSERT_TRUE(flat);
    auto pasted = attributedStringWithRTFD(*flat);
    ASSERT_TRUE(pasted);
    ASSERT_TRUE(text.insertAttributedString(*pasted, location));
    text.checkForPencilDataOnPaste();
  }

  // The host's dictionary of the drawings inserted into `text`.
  static PencilAttachmentDictionary drawingsOf(const AttributedString& text) {
    PencilAttachmentDictionary drawings;
    for (std::uint64_t i = 0; i < text.length(); ++i)
      if (auto picture =
              std::dynamic_pointer_cast<RVMXScaledImageAttachment>(text.attachmentAtIndex(i)))
        if (auto drawing = picture->pencilAttachment(); drawing && drawing->uuid())
          drawings[*drawing->uuid()] = drawing;
    return drawings;
  }

  // What the host does for a save: pictures and drawings write their own files, the
  // drawings are appended for the write and taken out after it.
  void save(AttributedString& text, const PencilAttachmentDictionary& drawings,
            const std::string& path) {
    auto setSaving = [&](std::int64_t saving) {
      for (std::uint64_t i = 0; i < text.length(); ++i)
        if (auto own = std::dynamic_pointer_cast<RVMXTextAttachment>(text.attachmentAtIndex(i)))
          own->setSaving(saving);
      for (const auto& [identifier, drawing] : drawings)
        if (auto own = std::dynamic_pointer_cast<RVMXTextAttachment>(drawing))
          own->setSaving(saving);
    };
    setSaving(kSavingWritingOut);
    Range whole{0, text.length()};
    text.preSaveRTFD(&whole, drawings);
    EXPECT_TRUE(writeRTFDToPath(text, path));
    text.postSaveRTFD(whole);
    setSaving(kSavingEditing);
  }

  testing::ScopedCachesDirectory caches;
  testing::ScopedPasteboard pasteboard;
  testing::LogCapture log;
  testing::TempDir documents;
};

TEST_F(DrawingLife, ADrawingGoesThroughCopyPasteSaveAndLoadUnchanged) {
  Data strokes = testing::makeStrokes(4096, 5);

  // 1. Insertion: one picture in the text, both files in the caches directory.
  AttributedString text(u"Before  after");
  text.insertImage(testing::makePicture(240, 160), strokes, Range{7, 0});
  auto shown = pictureAt(text, 7);
  ASSERT_TRUE(shown && shown->pencilAttachment() && shown->pencilAttachment()->uuid());
  const std::string uuid = *shown->pencilAttachment()->uuid();
  EXPECT_EQ(caches.names(), (std::set<std::string>{uuid + ".jpeg", uuid + ".pencildata"}));

  // 2. Copy of "e <picture> a": the selection goes out with <uuid>.jpeg, the drawings'
  // item beside it, and the picture is back to editing afterwards.
  Range selection{5, 5};
  copyOrCut(text, selection, false);
  EXPECT_EQ(shown->saving(), kSavingEditing);
  EXPECT_EQ(shown->pencilAttachment()->saving(), kSavingEditing);
  EXPECT_FALSE(pencilDataDict);
  auto items = pasteboard->items();
  ASSERT_EQ(items.size(), 1u);
  EXPECT_EQ(items[0].types(), (std::vector<std::string>{kFlatRTFDType, RVPencilPasteboardData}));
  auto flat = FileWrapper::initWithSerializedRepresentation(*items[0].dataForType(kFlatRTFDType));
  ASSERT_TRUE(flat);
  ASSERT_EQ(flat->fileWrappers().count(uuid + ".jpeg"), 1u);
  EXPECT_EQ(flat->fileWrappers().at(uuid + ".jpeg")->regularFileContents(), shown->contents());

  // The item reads as the platform's keyed archive to an outside parser.
  std::string itemPath = documents.file("pencil.archive");
  ASSERT_TRUE(writeFileAtomically(itemPath, *items[0].dataForType(RVPencilPasteboardData)));
  auto reader = testing::runCommand("NODE_PATH='" CORVEL_NODE_MODULES "' node '" CORVEL_SUPPORT_DIR
                                    "/read-keyed-archive.js' '" +
                                    itemPath + "'");
  ASSERT_EQ(reader.status, 0) << reader.output;
  auto json = nlohmann::json::parse(reader.output);
  EXPECT_EQ(json["archiver"], "NSKeyedArchiver");
  EXPECT_EQ(json["rootIsUid"], true);
  EXPECT_EQ(json["entries"], (nlohmann::json{{uuid, hex(strokes)}}));

  // 3. Paste into another text: a plain picture named <uuid>.jpeg, and the strokes under
  // the same identifier.
  AttributedString other(u"Pasted: ");
  paste(other, other.length());
  ASSERT_EQ(other.string(), u"Pasted: e \uFFFC a");
  auto pastedPicture = other.attachmentAtIndex(10);
  EXPECT_EQ(other.fileIDForAttachment(pastedPicture), uuid);
  EXPECT_EQ(pastedPencilDataDictionary, (PencilDataDictionary{{uuid, strokes}}));
  EXPECT_EQ(decodedSize(pastedPicture), (Size{240, 160}));

  // 4. Save: the bundle holds the picture and the drawing under one identifier; the
  // appended drawing's character stays in the text as a plain character.
  std::string bundle = documents.file("Note.rtfd");
  std::uint64_t before = text.length();
  save(text, drawingsOf(text), bundle);
  EXPECT_EQ(namesIn(bundle),
            (std::set<std::string>{"TXT.rtf", uuid + ".jpeg", uuid + ".pencildata"}));
  EXPECT_EQ(readFile(bundle + "/" + uuid + ".pencildata"), strokes);
  EXPECT_EQ(text.length(), before + 1);
  EXPECT_FALSE(text.attachmentAtIndex(before));
  EXPECT_EQ(pictureAt(text, 7), shown);

  // 5. Load: the drawing comes out by its identifier with the bytes inserted, and the
  // picture decodes to its original size.
  auto loaded = attributedStringWithContentsOfRTFD(bundle);
  ASSERT_TRUE(loaded);
  std::uint64_t loadedLength = loaded->length();
  auto kept = loaded->removePencilAttachments();
  loaded->postLoadDocument();
  EXPECT_EQ(loaded->length(), loadedLength);
  ASSERT_EQ(kept.count(uuid), 1u);
  EXPECT_EQ(kept.size(), 1u);
  EXPECT_EQ(kept[uuid]->fileWrapper()->regularFileContents(), strokes);
  auto loadedPicture = loaded->attachmentAtIndex(7);
  EXPECT_EQ(loaded->fileIDForAttachment(loadedPicture), uuid);
  EXPECT_EQ(decodedSize(loadedPicture), (Size{240, 160}));

  // The kept drawings go back in at the next save, and come out again unchanged.
  std::string again = documents.file("Again.rtfd");
  save(*loaded, kept, again);
  auto reloaded = attributedStringWithContentsOfRTFD(again);
  ASSERT_TRUE(reloaded);
  auto keptAgain = reloaded->removePencilAttachments();
  ASSERT_EQ(keptAgain.count(uuid), 1u);
  EXPECT_EQ(keptAgain[uuid]->fileWrapper()->regularFileContents(), strokes);
  EXPECT_TRUE(log.lines().empty());
}

TEST_F(DrawingLife, ACutDrawingPastesElsewhere) {
  Data strokes = testing::makeStrokes(777, 6);
  AttributedString text(u"ab");
  text.insertImage(testing::makePicture(33, 21), strokes, Range{1, 0});
  auto shown = pictureAt(text, 1);
  const std::string uuid = *shown->pencilAttachment()->uuid();
  copyOrCut(text, Range{1, 2}, true);
  EXPECT_EQ(text.string(), u"a");
  // The selection now runs past the end: the cut picture keeps writing out.
  EXPECT_EQ(shown->saving(), kSavingWritingOut);
  EXPECT_FALSE(pencilDataDict);

  AttributedString target;
  paste(target, 0);
  ASSERT_EQ(target.string(), u"\uFFFCb");
  EXPECT_EQ(target.fileIDForAttachment(target.attachmentAtIndex(0)), uuid);
  EXPECT_EQ(pastedPencilDataDictionary, (PencilDataDictionary{{uuid, strokes}}));
  EXPECT_EQ(decodedSize(target.attachmentAtIndex(0)), (Size{33, 21}));
}

TEST_F(DrawingLife, TwoDrawingsSaveAndLoadEachWithItsOwnStrokes) {
  Data strokesA = testing::makeStrokes(1000, 7), strokesB = testing::makeStrokes(20000, 8);
  AttributedString text(u"one  two ");
  text.insertImage(testing::makePicture(50, 40), strokesA, Range{4, 0});
  text.insertImage(testing::makePicture(70, 20), strokesB, Range{text.length(), 0});
  auto drawings = drawingsOf(text);
  ASSERT_EQ(drawings.size(), 2u);
  const std::string a = *pictureAt(text, 4)->pencilAttachment()->uuid();
  const std::string b = *pictureAt(text, 10)->pencilAttachment()->uuid();

  std::string bundle = documents.file("Two.rtfd");
  save(text, drawings, bundle);
  EXPECT_EQ(namesIn(bundle), (std::set<std::string>{"TXT.rtf", a + ".jpeg", a + ".pencildata",
                                                    b + ".jpeg", b + ".pencildata"}));

  auto loaded = attributedStringWithContentsOfRTFD(bundle);
  ASSERT_TRUE(loaded);
  std::uint64_t length = loaded->length();
  auto kept = loaded->removePencilAttachments();
  EXPECT_EQ(loaded->length(), length);
  ASSERT_EQ(kept.size(), 2u);
  EXPECT_EQ(kept[a]->fileWrapper()->regularFileContents(), strokesA);
  EXPECT_EQ(kept[b]->fileWrapper()->regularFileContents(), strokesB);
  EXPECT_EQ(loaded->fileIDForAttachment(loaded->attachmentAtIndex(4)), a);
  EXPECT_EQ(loaded->fileIDForAttachment(loaded->attachmentAtIndex(10)), b);
  EXPECT_EQ(decodedSize(loaded->attachmentAtIndex(4)), (Size{50, 40}));
  EXPECT_EQ(decodedSize(loaded->attachmentAtIndex(10)), (Size{70, 20}));
}

}  // namespace
}  // namespace corvel
