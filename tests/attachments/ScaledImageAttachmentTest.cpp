#include <gtest/gtest.h>

#include "Corvelbase/RVMXScaledImageAttachment.h"
#include "Corvelbase/platform/Base64.h"
#include "Corvelbase/platform/Files.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

std::optional<Data> unbase64(const std::optional<Data>& text) {
  return text ? base64Decoding(std::string(text->begin(), text->end())) : std::nullopt;
}

TEST(ScaledImageAttachment, ScalesAPictureWiderThanItsLineToNineTenths) {
  testing::ScopedCachesDirectory caches;
  auto wide = RVMXScaledImageAttachment::initWithImage(testing::makePicture(1000, 500), nullptr);
  auto broken = RVMXScaledImageAttachment::init();
  broken->setContents(Data{'n', 'o', 'p', 'e'});
  // The expected digits carry the ratio rounded to a 32-bit float, computed outside.
  struct Case {
    std::shared_ptr<RVMXScaledImageAttachment> attachment;
    double lineWidth;
    std::int64_t saving;
    Rect expected;
  } cases[] = {
      {wide, 400, 0, Rect(0, 0, 360.00001430511475, 180.00000715255737)},
      {wide, 1000, 0, Rect(0, 0, 1000, 500)},  // exactly as wide: not scaled
      // The line width is narrowed to a float first (400.0001 -> 400.000091552734375).
      {wide, 400.0001, 0, Rect(0, 0, 360.0000739097595, 180.00003695487976)},
      // No picture at text export, none inherited while writing out, none decodable.
      {wide, 400, 2, RectZero},
      {wide, 400, 1, RectZero},
      {broken, 400, 0, RectZero},
  };
  for (const auto& c : cases) {
    c.attachment->setSaving(c.saving);
    Rect line(0, 0, c.lineWidth, 20);
    EXPECT_EQ(c.attachment->attachmentBoundsForTextContainer(nullptr, line, Point{}, 0), c.expected)
        << c.lineWidth << " at " << c.saving;
  }
}

TEST(ScaledImageAttachment, NamesItsFileAfterTheDrawingAndStaysInTheCaches) {
  testing::ScopedCachesDirectory caches;
  auto drawing = RVPencilAttachment::init();
  drawing->setUuid("X");
  auto picture = RVMXScaledImageAttachment::initWithImage(testing::makePicture(30, 20), drawing);
  EXPECT_EQ(picture->fw()->filename(), "X.jpeg");
  EXPECT_EQ(readFile(caches.file("X.jpeg")), picture->contents());
  picture->createFileWrapper(Data{1, 2});  // the same name again
  EXPECT_EQ(readFile(caches.file("X.jpeg")), (Data{1, 2}));
  // Without a drawing uuid, a fresh name for every write.
  auto plain = RVMXScaledImageAttachment::initWithImage(testing::makePicture(8, 8), nullptr);
  plain->setPencilAttachment(RVPencilAttachment::init());
  plain->createFileWrapper(Data{3});
  EXPECT_EQ(caches.names().size(), 3u);
  // A uuid that would lead out of the caches directory writes nothing.
  drawing->setUuid("../escaped");
  picture->createFileWrapper(Data{5});
  EXPECT_FALSE(picture->fw());
  EXPECT_EQ(caches.names().size(), 3u);
  // Only while writing out does the attachment give its own file.
  auto inherited = FileWrapper::initRegularFileWithContents(Data{1});
  plain->setFileWrapper(inherited);
  EXPECT_EQ(plain->fileWrapper(), inherited);
  plain->setSaving(kSavingWritingOut);
  EXPECT_EQ(plain->fileWrapper(), plain->fw());
}

TEST(ScaledImageAttachment, DecodesOnceAndExportsBase64JPEG) {
  testing::ScopedCachesDirectory caches;
  auto picture = RVMXScaledImageAttachment::initWithImage(testing::makePicture(30, 20), nullptr);
  auto jpeg = picture->contents();
  auto decoded = picture->image();
  ASSERT_TRUE(decoded);
  EXPECT_EQ(decoded->size(), (Size{30, 20}));
  picture->setContents(*testing::makePicture(5, 5)->jpegData(0.9));
  EXPECT_EQ(picture->image(), decoded);  // cached, never refreshed
  picture->setContents(jpeg);

  // At text export: no picture, and the contents are base64 of the inherited image's
  // JPEG in CR LF lines of 64, or, without one, the contents as they are.
  picture->setSaving(kSavingTextExport);
  EXPECT_FALSE(picture->image());
  EXPECT_EQ(picture->contents(), jpeg);
  picture->setImage(testing::makePicture(64, 48));
  auto text = picture->contents();
  ASSERT_TRUE(text && text->size() > 66);
  EXPECT_EQ(std::string(text->begin() + 64, text->begin() + 66), "\r\n");
  EXPECT_EQ(testing::decodedSize(unbase64(text)), (Size{64, 48}));

  // A PNG picture is re-encoded as JPEG.
  Data png = *readFile(testing::fixturePath("images/sample.png"));
  auto fromPNG = RVMXScaledImageAttachment::init();
  fromPNG->setContents(png);
  auto reencoded = unbase64(fromPNG->encodedBase64Data());
  ASSERT_TRUE(reencoded && reencoded->size() > 2);
  EXPECT_EQ(Data(reencoded->begin(), reencoded->begin() + 2), (Data{0xFF, 0xD8}));
  EXPECT_EQ(testing::decodedSize(reencoded), (Size{24, 16}));
  EXPECT_FALSE(RVMXScaledImageAttachment::init()->encodedBase64Data());
}

}  // namespace
}  // namespace corvel
