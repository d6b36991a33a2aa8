// A picture in the text, shrunk to fit its line, that may carry a pencil drawing.
//
// The picture is kept as JPEG data (the attachment's contents, type "public.jpeg") and,
// for writing out, as a JPEG file at the top of the caches directory named
// "<identifier>.jpeg". The identifier is the uuid of `pencilAttachment` when there is a
// drawing, so its picture "<uuid>.jpeg" sits beside its strokes "<uuid>.pencildata" and
// the two can be matched again after the text has been saved and loaded; a plain picture
// gets a fresh UUID each time its file is written. The library never deletes the files.
//
// What the attachment hands out follows `saving` (RVMXTextAttachment.h):
//
//   saving           fileWrapper()             image()                 contents()
//   1 (writing out)  fw(), else inherited      the inherited image     inherited
//   2 (text export)  inherited                 nullptr, always         base64 JPEG of the
//                                                                      inherited image *
//   anything else    inherited                 inherited, else the     inherited
//                                              picture decoded from
//                                              the data (cached)
//
//   * 64-character lines ended by CR LF; without an inherited image, the inherited
//     contents.
//
// Layout: attachmentBoundsForTextContainer gives the picture's size when it fits the
// proposed line, else the picture scaled (aspect kept) to nine tenths of the line width;
// see scaleImageSizeToWidth.
//
// Not locked: use an attachment on the thread that lays out and edits its text (the
// decoded picture is cached without a guard).
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "Corvelbase/Export.h"
#include "Corvelbase/RVMXTextAttachment.h"
#include "Corvelbase/RVPencilAttachment.h"

namespace corvel {

// The type of the picture's data, and fileType() when nothing else is known.
CORVEL_EXPORT extern const std::string RVMXScaledImageFileType;  // "public.jpeg"

class CORVEL_EXPORT RVMXScaledImageAttachment : public RVMXTextAttachment {
 public:
  explicit RVMXScaledImageAttachment(Passkey key) : RVMXTextAttachment(key) {}

  // An empty picture attachment with `saving` 0 and scaleImage false. Never nullptr.
  static std::shared_ptr<RVMXScaledImageAttachment> init();
  // The picture `image` encoded as JPEG at quality 0.9 (jpegDataForImage) becomes the
  // contents, with the type "public.jpeg"; `pencilStoke` (spelled so; may be null) becomes
  // pencilAttachment; then the file is written (createFileWrapper). `saving` is 0. A null
  // or undecodable image gives an attachment without contents and without a file. The
  // inherited `image` is not set: image() decodes the picture from the data when asked.
  // Never nullptr.
  static std::shared_ptr<RVMXScaledImageAttachment> initWithImage(
      const std::shared_ptr<Image>& image, std::shared_ptr<RVPencilAttachment> pencilStoke);

  // Sets scaleImage to false.
  void initScaledImage();

  // Writes `jpegData` to "<identifier>.jpeg" in the caches directory, the identifier being
  // pencilAttachment()'s uuid, or a fresh upper-case UUID when there is no drawing or it
  // has no uuid, and sets `fw` to a wrapper that has read the file whole. The write is
  // atomic; with a drawing a second write replaces the same file. Nothing happens without
  // data or without a caches directory (fw keeps its value). A failed write, an unreadable
  // file, or a drawing uuid that is not a plain file name (one holding '/', say, which
  // would lead out of the caches directory) leaves fw nullptr. Nothing is logged.
  void createFileWrapper(const std::optional<Data>& jpegData);

  // scaleImageSizeToWidth of the proposed line fragment's width narrowed to a 32-bit
  // float; the other arguments are not used.
  Rect attachmentBoundsForTextContainer(const TextContainer* textContainer,
                                        const Rect& proposedLineFragment,
                                        const Point& glyphPosition,
                                        std::uint64_t characterIndex) const override;

  // The rectangle at the origin with the size of image() (as this class answers it: the
  // zero size at `saving` 2 or for an undecodable picture), multiplied by a ratio: 1 when
  // the picture's width is at most `width`, else width * 0.9 / picture width computed in
  // double and rounded to a 32-bit float. The rounding is deliberate and shows in the last
  // digits: a 1000 x 500 picture on a 400-wide line gives (0, 0, 360.00001430511475,
  // 180.00000715255737), ratio 0.36000001430511475. A picture exactly as wide as the line
  // is not scaled. A negative or non-finite width gives the corresponding product (no
  // checks); it never fails.
  Rect scaleImageSizeToWidth(float width) const;

  // originalType() when set; else the inherited type; else "public.jpeg".
  std::optional<std::string> fileType() const override;
  // See the table above.
  std::shared_ptr<FileWrapper> fileWrapper() const override;
  std::optional<Data> contents() const override;
  std::shared_ptr<Image> image() const override;

  // Base64 (64-character lines, CR LF) of the JPEG at quality 0.9 of the first picture
  // found among: the inherited image, actualImage(), image(). The picture is always
  // re-encoded as JPEG, whatever format the data had. nullopt when there is no picture or
  // it cannot be encoded.
  std::optional<Data> encodedBase64Data() const override;

  // Stored for the host; this class never consults them.
  bool scaleImage() const { return scaleImage_; }
  void setScaleImage(bool scale) { scaleImage_ = scale; }
  const std::optional<Data>& pencilData() const { return pencilData_; }
  void setPencilData(std::optional<Data> data) { pencilData_ = std::move(data); }
  // The type reported by fileType() in place of the inherited one.
  const std::optional<std::string>& originalType() const { return originalType_; }
  void setOriginalType(std::optional<std::string> type) { originalType_ = std::move(type); }
  // The drawing behind the picture, or nullptr for a plain picture.
  const std::shared_ptr<RVPencilAttachment>& pencilAttachment() const { return pencilAttachment_; }
  void setPencilAttachment(std::shared_ptr<RVPencilAttachment> drawing) {
    pencilAttachment_ = std::move(drawing);
  }
  // The picture decoded from the data by image(), cached on first success and never
  // refreshed.
  const std::shared_ptr<Image>& actualImage() const { return actualImage_; }
  void setActualImage(std::shared_ptr<Image> image) { actualImage_ = std::move(image); }
  // The wrapper of the JPEG file this attachment wrote.
  const std::shared_ptr<FileWrapper>& fw() const { return fw_; }
  void setFw(std::shared_ptr<FileWrapper> wrapper) { fw_ = std::move(wrapper); }

  bool isKindOfClass(std::string_view className) const override;

 protected:
  // init(): the empty attachment, `saving` 0, then initScaledImage.
  bool initHook() override;

 private:
  bool scaleImage_ = false;
  std::optional<std::string> originalType_;
  std::optional<Data> pencilData_;
  std::shared_ptr<RVPencilAttachment> pencilAttachment_;
  mutable std::shared_ptr<Image> actualImage_;
  std::shared_ptr<FileWrapper> fw_;
};

}  // namespace corvel
