#include <gtest/gtest.h>

#include "Corvelbase/RVMXTextAttachment.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

// Stand-ins for the drawing and scaled-image subclasses: only their class names matter to
// the kind tests.
class PencilLike : public RVMXTextAttachment {
 public:
  explicit PencilLike(Passkey k) : RVMXTextAttachment(k) {}
  static std::shared_ptr<PencilLike> make() { return alloc<PencilLike>(); }
  bool isKindOfClass(std::string_view name) const override {
    return name == kRVPencilAttachmentClassName || RVMXTextAttachment::isKindOfClass(name);
  }
};

class ScaledLike : public RVMXTextAttachment {
 public:
  explicit ScaledLike(Passkey k) : RVMXTextAttachment(k) {}
  static std::shared_ptr<ScaledLike> make() { return alloc<ScaledLike>(); }
  bool isKindOfClass(std::string_view name) const override {
    return name == kRVMXScaledImageAttachmentClassName || RVMXTextAttachment::isKindOfClass(name);
  }
};

std::shared_ptr<FileWrapper> wrapperNamed(const std::optional<std::string>& filename) {
  auto w = FileWrapper::initRegularFileWithContents(Data{1});
  w->setFilename(filename);
  return w;
}

TEST(FileTypes, KindsComeFromTheTypeAndOnlyWithoutOneFromTheFile) {
  testing::TempDir dir;
  for (const char* name : {"clip.mov", "song.mp3", "paper.pdf", "photo.png", "notes.txt"})
    ASSERT_TRUE(writeFileAtomically(dir.file(name), Data{0}));
  auto png = Image::initWithData(*readFile(testing::fixturePath("images/sample.png")));
  struct Case {
    const char* name;
    bool withImage;
    std::optional<std::string> fileType;
    std::optional<std::string> filename;  // of the file wrapper, when there is one
    bool image, video, pdf, audio;
  } cases[] = {
      // A present image makes any attachment an image, without hiding its type.
      {"image with pdf type", true, "com.adobe.pdf", std::nullopt, true, false, true, false},
      {"image alone", true, std::nullopt, std::nullopt, true, false, false, false},
      // A present type decides; the file name is not looked at, even when it disagrees.
      {"png type, movie file", false, "public.png", dir.file("clip.mov"), true, false, false,
       false},
      {"data type, pdf file", false, "public.data", dir.file("paper.pdf"), false, false, false,
       false},
      {"mpeg-4 video", false, "public.mpeg-4", std::nullopt, false, true, false, false},
      {"mp3", false, "public.mp3", std::nullopt, false, false, false, true},
      {"any case", false, "COM.Adobe.PDF", std::nullopt, false, false, true, false},
      {"text is nothing of these", false, "public.plain-text", std::nullopt, false, false, false,
       false},
      // Without a type, the file's type on disk.
      {"movie file", false, std::nullopt, dir.file("clip.mov"), false, true, false, false},
      {"audio file", false, std::nullopt, dir.file("song.mp3"), false, false, false, true},
      {"pdf file", false, std::nullopt, dir.file("paper.pdf"), false, false, true, false},
      {"png file", false, std::nullopt, dir.file("photo.png"), true, false, false, false},
      {"missing file", false, std::nullopt, dir.file("absent.png"), false, false, false, false},
      {"bare name of no file here", false, std::nullopt, "photo.png", false, false, false, false},
      {"wrapper without a name", false, std::nullopt, std::nullopt, false, false, false, false},
  };
  for (const auto& c : cases) {
    auto a = TextAttachment::initWithData(std::nullopt, c.fileType);
    if (c.withImage) a->setImage(png);
    if (c.filename || !c.withImage) a->setFileWrapper(wrapperNamed(c.filename));
    EXPECT_EQ(a->isImage(), c.image) << c.name;
    EXPECT_EQ(a->isVideo(), c.video) << c.name;
    EXPECT_EQ(a->isPDF(), c.pdf) << c.name;
    EXPECT_EQ(a->isAudio(), c.audio) << c.name;
  }
  // No wrapper and no type: nothing.
  auto bare = TextAttachment::init();
  EXPECT_FALSE(bare->isImage() || bare->isVideo() || bare->isPDF() || bare->isAudio());

  // The two helpers on their own, absent arguments included.
  EXPECT_FALSE(bare->isFile(std::nullopt, "public.data"));
  EXPECT_FALSE(bare->isFile(dir.file("clip.mov"), std::nullopt));
  EXPECT_TRUE(bare->isFile(dir.file("clip.mov"), "public.audiovisual-content"));
  EXPECT_TRUE(bare->isFile(dir.path(), "public.folder"));
  EXPECT_FALSE(bare->doesFileType(std::nullopt, "public.item"));
  EXPECT_FALSE(bare->doesFileType("public.jpeg", std::nullopt));
  EXPECT_TRUE(bare->doesFileType("public.jpeg", "public.item"));
  EXPECT_FALSE(bare->doesFileType("public.item", "public.jpeg"));
}

TEST(FileTypes, ClassTestsComeBeforeNameTests) {
  struct Case {
    const char* name;
    std::shared_ptr<TextAttachment> attachment;
    std::optional<std::string> filename;  // nullopt: no wrapper
    bool pencil;
  } cases[] = {
      {"pencil, lower case", PencilLike::make(), "A.pencildata", true},
      {"pencil, mixed case", PencilLike::make(), "B.PencilData", true},
      {"pencil in a folder", PencilLike::make(), "/x/y.d/C.PENCILDATA", true},
      {"pencil, other extension", PencilLike::make(), "D.jpeg", false},
      {"pencil, the word without a dot", PencilLike::make(), "pencildata", false},
      {"pencil without a wrapper", PencilLike::make(), std::nullopt, false},
      {"plain attachment with a drawing file", TextAttachment::init(), "E.pencildata", false},
      {"base class with a drawing file", RVMXTextAttachment::init(), "F.pencildata", false},
      {"scaled image with a drawing file", ScaledLike::make(), "G.pencildata", false},
  };
  for (const auto& c : cases) {
    if (c.filename) c.attachment->setFileWrapper(wrapperNamed(c.filename));
    EXPECT_EQ(c.attachment->isPencilData(), c.pencil) << c.name;
  }
  // The name test reads `filename`, not the preferred name.
  auto preferredOnly = PencilLike::make();
  auto w = wrapperNamed(std::nullopt);
  w->setPreferredFilename("H.pencildata");
  preferredOnly->setFileWrapper(w);
  EXPECT_FALSE(preferredOnly->isPencilData());

  EXPECT_TRUE(ScaledLike::make()->isScaledImage());
  EXPECT_FALSE(PencilLike::make()->isScaledImage());
  EXPECT_FALSE(RVMXTextAttachment::init()->isScaledImage());
  EXPECT_FALSE(TextAttachment::init()->isScaledImage());
}

// Records the data-and-type initialiser that copying must run, and can refuse.
class Recording : public RVMXTextAttachment {
 public:
  explicit Recording(Passkey k) : RVMXTextAttachment(k) {}
  static inline int calls = 0;
  static inline bool refuse = false;
  std::optional<Data> seenData;
  std::optional<std::string> seenType;

 protected:
  bool initWithDataHook(std::optional<Data> data, std::optional<std::string> type) override {
    ++calls;
    seenData = data;
    seenType = type;
    if (refuse) return false;
    return RVMXTextAttachment::initWithDataHook(std::move(data), std::move(type));
  }
};

TEST(FileTypes, CopyingRunsTheTargetClassInitialiser) {
  auto picture = Image::initWithData(*readFile(testing::fixturePath("images/sample.png")));
  auto source = TextAttachment::initWithData(Data{7, 8, 9}, "public.png");
  auto wrapper = wrapperNamed("s.png");
  source->setFileWrapper(wrapper);
  source->setImage(Image::initWithData(*readFile(testing::fixturePath("images/sample.gif"))));
  source->setBounds(Rect(1, 2, 30, 40));
  source->setLineLayoutPadding(6.5);

  Recording::calls = 0;
  auto copy = TextAttachment::initWithTextAttachment<Recording>(source, picture);
  ASSERT_TRUE(copy);
  EXPECT_EQ(Recording::calls, 1);
  EXPECT_EQ(copy->seenData, (Data{7, 8, 9}));
  EXPECT_EQ(copy->seenType, "public.png");
  EXPECT_EQ(copy->contents(), (Data{7, 8, 9}));
  EXPECT_EQ(copy->fileType(), "public.png");
  EXPECT_EQ(copy->fileWrapper(), wrapper);  // the very object
  EXPECT_EQ(copy->image(), picture);        // the given image, not the source's
  EXPECT_EQ(copy->bounds(), Rect(1, 2, 30, 40));
  EXPECT_EQ(copy->lineLayoutPadding(), 6.5);
  EXPECT_EQ(copy->saving(), kSavingEditing);

  // A null image clears it; before platform 12 the padding stays at its default.
  PlatformRegistry::setPlatformVersion({11, 6, 0});
  auto older = TextAttachment::initWithTextAttachment(source, nullptr);
  PlatformRegistry::setPlatformVersion({});
  ASSERT_TRUE(older);
  EXPECT_EQ(older->image(), nullptr);
  EXPECT_EQ(older->lineLayoutPadding(), kDefaultLineLayoutPadding);
  EXPECT_EQ(older->bounds(), Rect(1, 2, 30, 40));

  // An initialiser that gives nil makes the copy nil; so does no source.
  Recording::refuse = true;
  EXPECT_FALSE(TextAttachment::initWithTextAttachment<Recording>(source, picture));
  Recording::refuse = false;
  EXPECT_FALSE(TextAttachment::initWithTextAttachment(nullptr, picture));
}

}  // namespace
}  // namespace corvel
