// Text attachments: the object that an attachment character (U+FFFC) of an attributed
// string carries in its attachment attribute.
//
// An attachment holds, independently of one another, `contents` (bytes) with their
// `fileType` (a type identifier), a `fileWrapper`, an `image`, layout `bounds` and a
// `lineLayoutPadding`. They are plain stored values: setting one leaves the others as
// they are. Attachments have identity (two attachments are equal only when they are the
// same object) and are shared through `std::shared_ptr`. They are not locked: use one on
// the thread that edits its text.
//
// Subclassing. `contents`, `fileType`, `fileWrapper`, `image`, the layout bounds and
// `encodedBase64Data` are virtual, and the library's own code always reads them through
// these getters, so an override is what every caller sees. Objects are made only by the
// static initialisers (`init...`); each allocates with `alloc<T>()` and runs the
// protected virtual hook of its initialiser (`initHook`, `initWithDataHook`), so a
// subclass that overrides a hook has it run whenever an object of its class is made,
// including by `initWithTextAttachment<Subclass>`. A subclass gives itself a constructor
// taking `Passkey` (which only the family can name) and its own static factories:
//
//   class Drawing : public TextAttachment {
//    public:
//     explicit Drawing(Passkey key) : TextAttachment(key) {}
//     static std::shared_ptr<Drawing> initWithData(std::optional<Data> d,
//                                                  std::optional<std::string> t) {
//       auto a = alloc<Drawing>();
//       return a->initWithDataHook(std::move(d), std::move(t)) ? a : nullptr;
//     }
//    protected:
//     bool initWithDataHook(std::optional<Data> d, std::optional<std::string> t) override;
//   };
//
// Class tests use `isKindOfClass` with a class name, so code can ask about a subclass
// that lives elsewhere in the library; every subclass answers its own name and then
// asks its parent.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/FileWrapper.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// The layout object that lays out the text; the library never looks inside it.
class TextContainer;

// The class name that TextAttachment answers to in isKindOfClass.
inline constexpr std::string_view kTextAttachmentClassName = "NSTextAttachment";
// The line layout padding of a new attachment.
inline constexpr double kDefaultLineLayoutPadding = 0.0;

class CORVEL_EXPORT TextAttachment : public std::enable_shared_from_this<TextAttachment> {
 protected:
  // Only the attachment family can name this, so only its factories construct objects.
  struct Passkey {
    explicit Passkey() = default;
  };

 public:
  explicit TextAttachment(Passkey) {}
  virtual ~TextAttachment();
  TextAttachment(const TextAttachment&) = delete;
  TextAttachment& operator=(const TextAttachment&) = delete;

  // An empty attachment. Never nullptr unless a subclass's initHook refuses.
  static std::shared_ptr<TextAttachment> init();
  // An attachment with `contentData` and its type `uti` (either may be absent).
  static std::shared_ptr<TextAttachment> initWithData(std::optional<Data> contentData,
                                                      std::optional<std::string> uti);
  // An attachment whose file wrapper is `fileWrapper` (may be null).
  static std::shared_ptr<TextAttachment> initWithFileWrapper(std::shared_ptr<FileWrapper> wrapper);

  virtual std::optional<Data> contents() const { return contents_; }
  void setContents(std::optional<Data> contents) { contents_ = std::move(contents); }
  virtual std::optional<std::string> fileType() const { return fileType_; }
  void setFileType(std::optional<std::string> type) { fileType_ = std::move(type); }
  virtual std::shared_ptr<FileWrapper> fileWrapper() const { return fileWrapper_; }
  void setFileWrapper(std::shared_ptr<FileWrapper> wrapper) { fileWrapper_ = std::move(wrapper); }
  virtual std::shared_ptr<Image> image() const { return image_; }
  void setImage(std::shared_ptr<Image> image) { image_ = std::move(image); }

  // The layout rectangle; the zero rectangle until set.
  Rect bounds() const { return bounds_; }
  void setBounds(const Rect& bounds) { bounds_ = bounds; }
  double lineLayoutPadding() const { return lineLayoutPadding_; }
  void setLineLayoutPadding(double padding) { lineLayoutPadding_ = padding; }

  // The rectangle the attachment takes on a line: `bounds` when it has a size, else the
  // size of `image()` at the origin, else the zero rectangle. The arguments describe the
  // line and are for subclasses that fit themselves to it.
  virtual Rect attachmentBoundsForTextContainer(const TextContainer* textContainer,
                                                const Rect& proposedLineFragment,
                                                const Point& glyphPosition,
                                                std::uint64_t characterIndex) const;

  // True when this object's class is `className` or derives from it.
  virtual bool isKindOfClass(std::string_view className) const;

  // ---- Category fileTypes (attachments/TextAttachmentFileTypes.cpp) ----

  // A new attachment of class T copying `attachment`: made by T's data-and-type
  // initialiser (so T's initWithDataHook runs) from the source's contents() and
  // fileType(); then it takes the source's very file wrapper object, `image` (null
  // clears it) and the source's bounds, and, on platform version 12.0 or later only,
  // the source's lineLayoutPadding. nullptr when `attachment` is null or T's initialiser
  // gives nil.
  template <class T = TextAttachment>
  static std::shared_ptr<T> initWithTextAttachment(
      const std::shared_ptr<TextAttachment>& attachment, std::shared_ptr<Image> image) {
    if (!attachment) return nullptr;
    auto receiver = alloc<T>();
    if (!receiver->initWithTextAttachmentHook(*attachment, std::move(image))) return nullptr;
    return receiver;
  }

  // True at once when image() is set; otherwise the kind test with "public.image".
  bool isImage() const;
  // The kind tests with "public.movie", "com.adobe.pdf" and "public.audio". The kind
  // test: with a fileType(), whether it conforms to the kind (a type that does not is a
  // final false); only without one, isFile of the file wrapper's filename.
  bool isVideo() const;
  bool isPDF() const;
  bool isAudio() const;
  // Whether the file at `path` has a type conforming to `type`; false for no path or a
  // file whose type cannot be found (missing, unreadable).
  bool isFile(const std::optional<std::string>& path, const std::optional<std::string>& type) const;
  // Type conformance (transitive, case-insensitive); false when either is absent.
  bool doesFileType(const std::optional<std::string>& fileType,
                    const std::optional<std::string>& conformTo) const;
  // True for a scaled-image attachment (RVMXScaledImageAttachment or a subclass).
  bool isScaledImage() const;
  // True for a pencil attachment (RVPencilAttachment or a subclass) whose fileWrapper()
  // has a filename with the extension "pencildata" in any case; the class test comes
  // first, so a plain attachment with such a file is not pencil data.
  bool isPencilData() const;

  // ---- Category BaseEncode (attachments/TextAttachmentBaseEncode.cpp) ----

  // JPEG bytes of all representations of `image` at compression factor 0.9; nullopt
  // for no image or one that cannot be written.
  std::optional<Data> jpegDataForImage(const std::shared_ptr<Image>& image) const;
  // Base64 (64-character lines, CR LF) of the first of: the JPEG of image(); contents()
  // as they are; the JPEG of an image decoded from the file wrapper's contents. nullopt
  // when the chosen source is absent or gives no data.
  virtual std::optional<Data> encodedBase64Data() const;

 protected:
  template <class T>
  static std::shared_ptr<T> alloc() {
    return std::make_shared<T>(Passkey{});
  }
  // The initialisers' work, run on a freshly allocated object; false means the
  // initialiser gives nil. Overrides call the parent's hook first. Like the platform's
  // designated initialiser, initWithDataHook is where every initialiser ends up:
  // initHook runs it with no data and no type.
  virtual bool initHook();
  virtual bool initWithDataHook(std::optional<Data> contentData, std::optional<std::string> uti);
  // The copy of initWithTextAttachment, run on a fresh object of the target class.
  bool initWithTextAttachmentHook(const TextAttachment& source, std::shared_ptr<Image> image);

 private:
  bool kindTest(std::string_view type) const;

  std::optional<Data> contents_;
  std::optional<std::string> fileType_;
  std::shared_ptr<FileWrapper> fileWrapper_;
  std::shared_ptr<Image> image_;
  Rect bounds_;
  double lineLayoutPadding_ = kDefaultLineLayoutPadding;
};

}  // namespace corvel
