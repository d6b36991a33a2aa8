#include <gtest/gtest.h>

#include "Corvelbase/RVPencilAttachment.h"
#include "Corvelbase/platform/Files.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

using testing::ScopedCachesDirectory;

TEST(PencilAttachment, MakingADrawingWritesItsStrokesUnderAFreshUUID) {
  ScopedCachesDirectory caches;
  Data strokes = testing::makeStrokes(3000, 1);
  auto drawing = RVPencilAttachment::initWithData(strokes, "public.data");
  ASSERT_TRUE(drawing);
  ASSERT_TRUE(drawing->uuid());
  EXPECT_TRUE(testing::isUpperCaseUUID(*drawing->uuid())) << *drawing->uuid();
  std::string name = *drawing->uuid() + ".pencildata";
  EXPECT_EQ(caches.names(), std::set<std::string>{name});
  EXPECT_EQ(readFile(caches.file(name)), strokes);  // no header, no framing
  ASSERT_TRUE(drawing->fw());
  EXPECT_EQ(drawing->fw()->filename(), name);
  EXPECT_EQ(drawing->fw()->preferredFilename(), name);
  EXPECT_EQ(drawing->strokeData(), strokes);
  EXPECT_EQ(drawing->saving(), kSavingEditing);
  EXPECT_FALSE(drawing->displayImage());

  // The same bytes again: another identifier, another file; the first stays.
  auto twin = RVPencilAttachment::initWithData(strokes, "public.data");
  ASSERT_TRUE(twin && twin->uuid());
  EXPECT_NE(*twin->uuid(), *drawing->uuid());
  EXPECT_EQ(caches.names().size(), 2u);

  // Writing again renames the drawing and leaves the earlier file where it was.
  std::string first = *drawing->uuid();
  drawing->createFileWrapper(Data{1, 2, 3});
  EXPECT_NE(*drawing->uuid(), first);
  EXPECT_EQ(drawing->strokeData(), (Data{1, 2, 3}));
  EXPECT_EQ(readFile(caches.file(first + ".pencildata")), strokes);
  EXPECT_EQ(caches.names().size(), 3u);
}

TEST(PencilAttachment, WhatItHandsOutFollowsSaving) {
  ScopedCachesDirectory caches;
  Data strokes = testing::makeStrokes(64, 2);
  auto drawing = RVPencilAttachment::initWithData(strokes, "com.example.ink");
  ASSERT_TRUE(drawing && drawing->fw());
  struct Case {
    std::int64_t saving;
    bool givesFile;
    bool givesContents;
  } cases[] = {
      {0, false, true},  // editing: kept in memory only
      {1, true, false},  // writing out: the file, never an inline copy
      {2, false, true},  // text export behaves as editing here
      {7, false, true},  // unknown states behave as editing
      {-1, false, true},
  };
  for (const auto& c : cases) {
    drawing->setSaving(c.saving);
    EXPECT_EQ(drawing->fileWrapper(), c.givesFile ? drawing->fw() : nullptr) << c.saving;
    EXPECT_EQ(drawing->contents(), c.givesContents ? std::optional<Data>(strokes) : std::nullopt)
        << c.saving;
    // The strokes never depend on the state, and the type never on the creation.
    EXPECT_EQ(drawing->strokeData(), strokes) << c.saving;
    EXPECT_EQ(drawing->fileType(), "public.data") << c.saving;
    // Pencil data is recognised only while it is written out.
    EXPECT_EQ(drawing->isPencilData(), c.givesFile) << c.saving;
  }
}

TEST(PencilAttachment, WithoutDataOrCachesItKeepsNoFile) {
  {
    ScopedCachesDirectory caches;
    auto empty = RVPencilAttachment::initWithData(std::nullopt, "public.data");
    ASSERT_TRUE(empty);
    EXPECT_FALSE(empty->uuid());
    EXPECT_FALSE(empty->fw());
    EXPECT_FALSE(empty->strokeData());
    EXPECT_TRUE(caches.names().empty());
    auto plain = RVPencilAttachment::init();
    ASSERT_TRUE(plain);
    EXPECT_FALSE(plain->uuid());
    EXPECT_EQ(plain->fileType(), "public.data");
  }
  // A caches directory that cannot exist (its parent is a file): nothing is written and
  // the strokes fall back to the inherited wrapper.
  testing::TempDir dir;
  ASSERT_TRUE(writeFileAtomically(dir.file("plain"), Data{0}));
  auto previous = PlatformRegistry::cachesDirectoryOverride();
  PlatformRegistry::setCachesDirectory(dir.file("plain/caches"));
  auto orphan = RVPencilAttachment::initWithData(Data{5, 6}, "public.data");
  PlatformRegistry::setCachesDirectory(previous);
  ASSERT_TRUE(orphan);
  EXPECT_FALSE(orphan->uuid());
  EXPECT_FALSE(orphan->fw());
  EXPECT_FALSE(orphan->strokeData());
  EXPECT_EQ(orphan->contents(), (Data{5, 6}));
  orphan->setFileWrapper(FileWrapper::initRegularFileWithContents(Data{9}));
  EXPECT_EQ(orphan->strokeData(), Data{9});
  orphan->setSaving(kSavingWritingOut);
  EXPECT_EQ(orphan->fileWrapper()->regularFileContents(), Data{9});
}

TEST(PencilAttachment, CopyingAnAttachmentIntoADrawingWritesANewFile) {
  ScopedCachesDirectory caches;
  auto source = TextAttachment::initWithData(Data{4, 5, 6}, "public.png");
  source->setFileWrapper(FileWrapper::initRegularFileWithContents(Data{7}));
  auto copy = TextAttachment::initWithTextAttachment<RVPencilAttachment>(source, nullptr);
  ASSERT_TRUE(copy && copy->uuid());
  EXPECT_EQ(readFile(caches.file(*copy->uuid() + ".pencildata")), (Data{4, 5, 6}));
  EXPECT_EQ(copy->strokeData(), (Data{4, 5, 6}));  // its own file before the source's wrapper
  EXPECT_EQ(copy->fileType(), "public.data");
  EXPECT_TRUE(copy->isKindOfClass(kRVPencilAttachmentClassName));
  EXPECT_TRUE(copy->isKindOfClass(kRVMXTextAttachmentClassName));
  EXPECT_FALSE(copy->isScaledImage());
}

}  // namespace
}  // namespace corvel
