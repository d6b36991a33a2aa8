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
}

TEST(ScaledImageAttachment, DecodesOnceAndExportsBase64JPEG) {
  testing::ScopedCachesDirectory caches;
  auto picture = RVMXScaledImageAttachment::initWithImage(testing::makePicture(30, 20), nullptr);
  auto jpeg = picture->contents();
  auto decoded = picture->image();
  ASSERT_TRUE(decoded);
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
}

}  // namespace
}  // namespace corvel
