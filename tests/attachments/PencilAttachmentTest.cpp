#include <gtest/gtest.h>

#include <regex>

#include "Corvelbase/RVPencilAttachment.h"
#include "Corvelbase/platform/Files.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

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

}  // namespace
}  // namespace corvel
