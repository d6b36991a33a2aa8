#include <gtest/gtest.h>

#include "Corvelbase/RVMXScaledImageAttachment.h"
#include "Corvelbase/platform/Base64.h"
#include "Corvelbase/platform/Files.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

using testing::ScopedCachesDirectory;

Size decodedSize(const std::optional<Data>& bytes) {
  auto image = bytes ? Image::initWithData(*bytes) : nullptr;
  return image ? image->size() : Size{};
}

bool isJPEG(const std::optional<Data>& bytes) {
  return bytes && bytes->size() > 2 && (*bytes)[0] == 0xFF && (*bytes)[1] == 0xD8;
}

TEST(ScaledImageAttachment, ScalesAPictureWiderThanItsLineToNineTenths) {
  ScopedCachesDirectory caches;
  auto wide = RVMXScaledImageAttachment::initWithImage(testing::makePicture(1000, 500), nullptr);
  auto small = RVMXScaledImageAttachment::initWithImage(testing::makePicture(25, 10), nullptr);
  auto broken = RVMXScaledImageAttachment::init();
  broken->setContents(Data{'n', 'o', 't', ' ', 'a', 'n', ' ', 'i', 'm', 'a', 'g', 'e'});
  // Expected digits carry the ratio rounded to a 32-bit float, computed outside.
  struct Case {
    const char* name;
    std::shared_ptr<RVMXScaledImageAttachment> attachment;
    double lineWidth;
    std::int64_t saving;
    Rect expected;
  } cases[] = {
      {"wider than the line", wide, 400, 0, Rect(0, 0, 360.00001430511475, 180.00000715255737)},
      {"one unit wider", wide, 999, 0, Rect(0, 0, 899.1000056266785, 449.55000281333923)},
      {"exactly as wide", wide, 1000, 0, Rect(0, 0, 1000, 500)},
      {"narrower", wide, 1200, 0, Rect(0, 0, 1000, 500)},
      // The line width is narrowed to a float first: 400.0001 becomes 400.000091552734375.
      {"width narrowed", wide, 400.0001, 0, Rect(0, 0, 360.0000739097595, 180.00003695487976)},
      {"small picture", small, 24, 0, Rect(0, 0, 21.60000056028366, 8.640000224113464)},
      // No picture at text export, none inherited while writing out, none decodable.
      {"text export", wide, 400, 2, Rect(0, 0, 0, 0)},
      {"writing out", wide, 400, 1, Rect(0, 0, 0, 0)},
      {"undecodable", broken, 400, 0, Rect(0, 0, 0, 0)},
  };
  for (const auto& c : cases) {
    ASSERT_TRUE(c.attachment) << c.name;
    c.attachment->setSaving(c.saving);
    Rect line(0, 0, c.lineWidth, 20);
    EXPECT_EQ(c.attachment->attachmentBoundsForTextContainer(nullptr, line, Point{}, 0), c.expected)
        << c.name;
    c.attachment->setSaving(0);
  }
}

TEST(ScaledImageAttachment, TypeAndWrapperFollowTheStoredValuesAndSaving) {
  ScopedCachesDirectory caches;
  auto picture = RVMXScaledImageAttachment::initWithImage(testing::makePicture(30, 20), nullptr);
  ASSERT_TRUE(picture && picture->fw());
  EXPECT_EQ(picture->fileType(), "public.jpeg");
  EXPECT_FALSE(picture->scaleImage());
  picture->setOriginalType("public.png");
  EXPECT_EQ(picture->fileType(), "public.png");
  EXPECT_EQ(RVMXScaledImageAttachment::init()->fileType(), "public.jpeg");  // no type at all
  auto copied = TextAttachment::initWithTextAttachment<RVMXScaledImageAttachment>(
      TextAttachment::initWithData(Data{1}, "com.compuserve.gif"), nullptr);
  EXPECT_EQ(copied->fileType(), "com.compuserve.gif");  // the inherited type
  EXPECT_TRUE(copied->isScaledImage());

  auto inherited = FileWrapper::initRegularFileWithContents(Data{1});
  struct Case {
    std::int64_t saving;
    bool ownFile;
    std::shared_ptr<FileWrapper> expected;
  } cases[] = {
      {0, true, nullptr},    {1, true, picture->fw()}, {2, true, nullptr},
      {0, false, inherited}, {1, false, inherited},    {2, false, inherited},
  };
  auto own = picture->fw();
  for (const auto& c : cases) {
    picture->setFw(c.ownFile ? own : nullptr);
    picture->setFileWrapper(c.ownFile ? nullptr : inherited);
    picture->setSaving(c.saving);
    EXPECT_EQ(picture->fileWrapper(), c.expected) << c.saving << " " << c.ownFile;
  }
}

TEST(ScaledImageAttachment, WritesItsPictureUnderTheDrawingsIdentifier) {
  ScopedCachesDirectory caches;
  auto drawing = RVPencilAttachment::init();
  drawing->setUuid("X");
  auto picture = RVMXScaledImageAttachment::initWithImage(testing::makePicture(30, 20), drawing);
  ASSERT_TRUE(picture && picture->fw());
  EXPECT_EQ(picture->pencilAttachment(), drawing);
  EXPECT_EQ(picture->fw()->filename(), "X.jpeg");
  EXPECT_EQ(readFile(caches.file("X.jpeg")), picture->contents());
  EXPECT_TRUE(isJPEG(picture->contents()));
  // A second write reuses the name; the drawing's identifier does not change.
  picture->createFileWrapper(Data{1, 2});
  EXPECT_EQ(readFile(caches.file("X.jpeg")), (Data{1, 2}));
  EXPECT_EQ(caches.names(), std::set<std::string>{"X.jpeg"});

  // Without a drawing (or with one that has no uuid) each write takes a fresh name.
  auto plain = RVMXScaledImageAttachment::initWithImage(testing::makePicture(8, 8), nullptr);
  plain->createFileWrapper(Data{3});
  plain->setPencilAttachment(RVPencilAttachment::init());
  plain->createFileWrapper(Data{4});
  EXPECT_EQ(caches.names().size(), 4u);
  EXPECT_TRUE(testing::isUpperCaseUUID(plain->fw()->filename()->substr(0, 36)));

  // An identifier that would lead out of the caches directory writes nothing.
  drawing->setUuid("../escaped");
  picture->createFileWrapper(Data{5});
  EXPECT_FALSE(picture->fw());
  EXPECT_FALSE(std::filesystem::exists(caches.path() + "/../escaped.jpeg"));
  EXPECT_EQ(caches.names().size(), 4u);

  // No picture, no file.
  auto none = RVMXScaledImageAttachment::initWithImage(nullptr, drawing);
  ASSERT_TRUE(none);
  EXPECT_FALSE(none->contents());
  EXPECT_FALSE(none->fw());
}

TEST(ScaledImageAttachment, DecodesItsPictureOnceAndHidesItForTextExport) {
  ScopedCachesDirectory caches;
  auto picture = RVMXScaledImageAttachment::initWithImage(testing::makePicture(30, 20), nullptr);
  auto decoded = picture->image();
  ASSERT_TRUE(decoded);
  EXPECT_EQ(decoded->size(), (Size{30, 20}));
  EXPECT_EQ(picture->actualImage(), decoded);
  // Cached and never refreshed, even when the data changes.
  picture->setContents(*testing::makePicture(5, 5)->jpegData(0.9));
  EXPECT_EQ(picture->image(), decoded);

  // The inherited wrapper's bytes come before the contents.
  auto fromWrapper = RVMXScaledImageAttachment::init();
  fromWrapper->setContents(*testing::makePicture(5, 5)->jpegData(0.9));
  fromWrapper->setFileWrapper(
      FileWrapper::initRegularFileWithContents(*testing::makePicture(12, 9)->jpegData(0.9)));
  EXPECT_EQ(fromWrapper->image()->size(), (Size{12, 9}));

  // Writing out shows only the inherited image; text export shows none.
  auto shown = testing::makePicture(7, 3);
  picture->setSaving(kSavingWritingOut);
  EXPECT_FALSE(picture->image());
  picture->setImage(shown);
  EXPECT_EQ(picture->image(), shown);
  picture->setSaving(kSavingTextExport);
  EXPECT_FALSE(picture->image());
  picture->setSaving(kSavingEditing);
  EXPECT_EQ(picture->image(), shown);
}

TEST(ScaledImageAttachment, ExportsBase64JPEG) {
  ScopedCachesDirectory caches;
  auto picture = RVMXScaledImageAttachment::initWithImage(testing::makePicture(60, 40), nullptr);
  auto jpeg = picture->contents();
  // At text export without an inherited image: the contents as they are.
  picture->setSaving(kSavingTextExport);
  EXPECT_EQ(picture->contents(), jpeg);
  // With one: its JPEG as base64 in 64-character lines ended by CR LF.
  picture->setImage(testing::makePicture(64, 48));
  auto text = picture->contents();
  ASSERT_TRUE(text);
  std::string base64(text->begin(), text->end());
  EXPECT_EQ(base64.substr(64, 2), "\r\n");
  EXPECT_EQ(base64.find("\r\n", 66), 130u);
  auto bytes = base64Decoding(base64);
  EXPECT_TRUE(isJPEG(bytes));
  EXPECT_EQ(decodedSize(bytes), (Size{64, 48}));

  // A PNG picture is re-encoded as JPEG; the general rule would pass the PNG through.
  Data png = *readFile(testing::fixturePath("images/sample.png"));
  auto fromPNG = RVMXScaledImageAttachment::init();
  fromPNG->setContents(png);
  auto generic = TextAttachment::initWithData(png, "public.png");
  auto encoded = fromPNG->encodedBase64Data();
  ASSERT_TRUE(encoded);
  auto reencoded = base64Decoding(std::string(encoded->begin(), encoded->end()));
  EXPECT_TRUE(isJPEG(reencoded));
  EXPECT_EQ(decodedSize(reencoded), (Size{24, 16}));
  auto passed = generic->encodedBase64Data();
  EXPECT_EQ(base64Decoding(std::string(passed->begin(), passed->end())), png);
  // Nothing to show, nothing to encode.
  EXPECT_FALSE(RVMXScaledImageAttachment::init()->encodedBase64Data());
}

}  // namespace
}  // namespace corvel
