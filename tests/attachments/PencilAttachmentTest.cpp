#include <gtest/gtest.h>

#include "Corvelbase/RVPencilAttachment.h"
#include "Corvelbase/platform/Files.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

TEST(PencilAttachment, EachDrawingWritesItsBytesUnderAFreshUpperCaseUUID) {
  testing::ScopedCachesDirectory caches;
  Data strokes = testing::makeStrokes(3000, 1);
  auto drawing = RVPencilAttachment::initWithData(strokes, "public.data");
  auto twin = RVPencilAttachment::initWithData(strokes, "public.data");
  ASSERT_TRUE(drawing->uuid() && twin->uuid());
  EXPECT_NE(*drawing->uuid(), *twin->uuid());
  EXPECT_EQ(drawing->uuid()->size(), 36u);
  EXPECT_EQ(drawing->uuid()->find_first_not_of("0123456789ABCDEF-"), std::string::npos);
  EXPECT_EQ(readFile(caches.file(*drawing->uuid() + ".pencildata")), strokes);  // as given
  // Without data there is nothing to name or write.
  auto empty = RVPencilAttachment::initWithData(std::nullopt, "public.data");
  EXPECT_FALSE(empty->uuid() || empty->fw() || empty->strokeData());
  EXPECT_EQ(caches.names().size(), 2u);
}

TEST(PencilAttachment, WhatItHandsOutFollowsSaving) {
  testing::ScopedCachesDirectory caches;
  Data strokes = testing::makeStrokes(64, 2);
  auto drawing = RVPencilAttachment::initWithData(strokes, "com.example.ink");
  ASSERT_TRUE(drawing->fw());
  struct Case {
    std::int64_t saving;
    bool writingOut;
  } cases[] = {{0, false}, {1, true}, {2, false}, {7, false}, {-1, false}};
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
