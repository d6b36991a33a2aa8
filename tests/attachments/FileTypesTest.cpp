#include <gtest/gtest.h>

#include "Corvelbase/RVMXTextAttachment.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

// A stand-in for a subclass that is only told apart by its class name.
template <const std::string_view& kClassName>
class Like : public RVMXTextAttachment {
 public:
  explicit Like(Passkey k) : RVMXTextAttachment(k) {}
  static std::shared_ptr<Like> make() { return alloc<Like>(); }
  bool isKindOfClass(std::string_view name) const override {
    return name == kClassName || RVMXTextAttachment::isKindOfClass(name);
  }
};
using PencilLike = Like<kRVPencilAttachmentClassName>;
using ScaledLike = Like<kRVMXScaledImageAttachmentClassName>;

// The kinds an attachment reports as four letters: Image, Video, Pdf, Audio, '-' for no.
std::string kinds(const TextAttachment& a) {
  return {a.isImage() ? 'I' : '-', a.isVideo() ? 'V' : '-', a.isPDF() ? 'P' : '-',
          a.isAudio() ? 'A' : '-'};
}

TEST(FileTypes, KindsComeFromTheTypeAndOnlyWithoutOneFromTheFile) {
  testing::TempDir dir;
  ASSERT_TRUE(writeFileAtomically(dir.file("clip.mov"), Data{0}));
  auto png = Image::initWithData(*readFile(testing::fixturePath("images/sample.png")));
  struct Case {
    bool withImage;
    std::optional<std::string> fileType;
    std::optional<std::string> filename;  // of the file wrapper, when there is one
    std::string kinds;
  } cases[] = {
      // A present image makes any attachment an image, without hiding its type.
      {true, "com.adobe.pdf", std::nullopt, "I-P-"},
      // A present type decides; the file name is not looked at, even when it disagrees.
      {false, "public.png", dir.file("clip.mov"), "I---"},
      {false, "public.mpeg-4", std::nullopt, "-V--"},
      {false, "public.mp3", std::nullopt, "---A"},
      {false, "COM.Adobe.PDF", std::nullopt, "--P-"},
      // Without a type, the file's type on disk.
      {false, std::nullopt, dir.file("clip.mov"), "-V--"},
      {false, std::nullopt, dir.file("absent.png"), "----"},
      {false, std::nullopt, std::nullopt, "----"},  // a wrapper without a name
  };
  for (const auto& c : cases) {
    auto a = TextAttachment::initWithData(std::nullopt, c.fileType);
    if (c.withImage) a->setImage(png);
    if (c.filename || !c.withImage) a->setFileWrapper(testing::wrapperNamed(c.filename));
    EXPECT_EQ(kinds(*a), c.kinds) << c.fileType.value_or("-") << " " << c.filename.value_or("-");
  }
  auto bare = TextAttachment::init();  // no wrapper and no type
  EXPECT_EQ(kinds(*bare), "----");

  // The helpers on their own: an absent argument answers no.
  EXPECT_FALSE(bare->isFile(dir.file("clip.mov"), std::nullopt));
  EXPECT_FALSE(bare->doesFileType(std::nullopt, "public.item"));
  EXPECT_FALSE(bare->doesFileType("public.item", "public.jpeg"));
}

TEST(FileTypes, ClassTestsComeBeforeNameTests) {
  struct Case {
    std::shared_ptr<TextAttachment> attachment;
    std::optional<std::string> filename;  // nullopt: no wrapper
    bool pencil;
  } cases[] = {
      {PencilLike::make(), "/x/y.d/C.PENCILDATA", true},
      {PencilLike::make(), "pencildata", false},  // the word without a dot
      {PencilLike::make(), std::nullopt, false},
      {TextAttachment::init(), "E.pencildata", false},
      {ScaledLike::make(), "G.pencildata", false},
      // Regression: a trailing slash hid the extension from the class test's name check.
      {PencilLike::make(), "/x/D.pencildata/", true},
  };
  for (const auto& c : cases) {
    if (c.filename) c.attachment->setFileWrapper(testing::wrapperNamed(c.filename));
    EXPECT_EQ(c.attachment->isPencilData(), c.pencil) << c.filename.value_or("no wrapper");
  }
  // The name test reads `filename`, not the preferred name.
  auto preferredOnly = PencilLike::make();
  preferredOnly->setFileWrapper(testing::wrapperNamed(std::nullopt, "H.pencildata"));
  EXPECT_FALSE(preferredOnly->isPencilData());
}

// Records the data-and-type initialiser that copying must run, and can refuse.
class Recording : public RVMXTextAttachment {
 public:
  explicit Recording(Passkey k) : RVMXTextAttachment(k) {}
  static inline bool refuse = false;
  std::optional<Data> seenData;
  std::optional<std::string> seenType;

 protected:
  bool initWithDataHook(std::optional<Data> data, std::optional<std::string> type) override {
    seenData = data;
    seenType = type;
    return !refuse && RVMXTextAttachment::initWithDataHook(std::move(data), std::move(type));
  }
};

TEST(FileTypes, CopyingRunsTheTargetClassInitialiser) {
  auto picture = Image::initWithData(*readFile(testing::fixturePath("images/sample.png")));
  auto source = TextAttachment::initWithData(Data{7, 8, 9}, "public.png");
  auto wrapper = testing::wrapperNamed("s.png");
  source->setFileWrapper(wrapper);
  source->setImage(Image::initWithData(*readFile(testing::fixturePath("images/sample.gif"))));
  source->setBounds(Rect(1, 2, 30, 40));
  source->setLineLayoutPadding(6.5);

  auto copy = TextAttachment::initWithTextAttachment<Recording>(source, picture);
  ASSERT_TRUE(copy);
  EXPECT_EQ(copy->seenData, (Data{7, 8, 9}));
  EXPECT_EQ(copy->seenType, "public.png");
  EXPECT_EQ(copy->fileWrapper(), wrapper);  // the very object
  EXPECT_EQ(copy->image(), picture);        // the given image, not the source's
  EXPECT_EQ(copy->bounds(), Rect(1, 2, 30, 40));
  EXPECT_EQ(copy->lineLayoutPadding(), 6.5);

  // A null image clears it; before platform 12 the padding stays at its default.
  PlatformRegistry::setPlatformVersion({11, 6, 0});
  auto older = TextAttachment::initWithTextAttachment(source, nullptr);
  PlatformRegistry::setPlatformVersion({});
  ASSERT_TRUE(older);
  EXPECT_EQ(older->image(), nullptr);
  EXPECT_EQ(older->lineLayoutPadding(), kDefaultLineLayoutPadding);

  // An initialiser that gives nil makes the copy nil; so does no source.
  Recording::refuse = true;
  EXPECT_FALSE(TextAttachment::initWithTextAttachment<Recording>(source, picture));
  Recording::refuse = false;
  EXPECT_FALSE(TextAttachment::initWithTextAttachment(nullptr, picture));
}

}  // namespace
}  // namespace corvel
