// A pencil drawing's stroke data, held as a text attachment with a file of its own.
//
// The stroke data is an opaque block of bytes from which the host can edit a drawing
// again; the library stores, names and hands out the bytes as given and never looks
// inside. During editing a drawing rides inside the RVMXScaledImageAttachment that shows
// its picture (`pencilAttachment`); it stands in the text by itself only while a text is
// saved with its drawings appended (see PencilDrawings.h).
//
// Every drawing owns one file at the top of the caches directory (cachesDirectory(), which
// PlatformRegistry::setCachesDirectory can move): "<uuid>.pencildata", holding the stroke
// bytes exactly as given. Its base name, `uuid`, is the drawing's identifier everywhere:
// the picture of the drawing is "<uuid>.jpeg", and the pasteboard item and the saved
// bundle key drawings by it. The library writes these files and never deletes them.
//
// What the attachment hands out follows `saving` (RVMXTextAttachment.h), and the two
// overrides are deliberately asymmetric:
//
//   saving          fileWrapper()                          contents()
//   1 (writing out) fw(), else the inherited wrapper       nullopt
//   anything else   nullptr                                the data it was made with
//
// so while a text is edited the drawing offers no file (the text keeps it in memory only),
// and while it is written out it offers only its file, so the written text carries
// "<uuid>.pencildata" and not an inline copy. strokeData() reads fw() directly and is the
// same in every state.
//
// Not locked: use an attachment on the thread that edits its text. Two attachments never
// share a file, since every file is named by a fresh UUID.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "Corvelbase/Export.h"
#include "Corvelbase/RVMXTextAttachment.h"

namespace corvel {

// The type every drawing reports as fileType(), and the type drawings are made with.
CORVEL_EXPORT extern const std::string RVPencilAttachmentFileType;  // "public.data"
// The extension of a drawing's file, without its dot.
CORVEL_EXPORT extern const std::string RVPencilDataExtension;  // "pencildata"

class CORVEL_EXPORT RVPencilAttachment : public RVMXTextAttachment {
 public:
  explicit RVPencilAttachment(Passkey key) : RVMXTextAttachment(key) {}

  // An empty drawing: no data, no file, `saving` 0.
  static std::shared_ptr<RVPencilAttachment> init();
  // A drawing holding `strokeData` as its contents with the type `uti`, whose file is
  // written at once (createFileWrapper), with `saving` 0. With no data the drawing has no
  // uuid, no fw and no strokeData. Never nullptr.
  static std::shared_ptr<RVPencilAttachment> initWithData(std::optional<Data> strokeData,
                                                          std::optional<std::string> uti);

  // Writes `strokeData` to a new file "<uuid>.pencildata" in the caches directory under a
  // fresh upper-case UUID, which replaces `uuid`, and sets `fw` to a wrapper that has read
  // the file whole (filename and preferredFilename "<uuid>.pencildata"). The write is
  // atomic; an earlier file of this drawing stays where it is.
  // Nothing happens without data, or when there is no caches directory (uuid and fw keep
  // their values). A failed write or unreadable file leaves fw nullptr; nothing is logged.
  void createFileWrapper(const std::optional<Data>& strokeData);

  // The stroke bytes: fw()'s contents, or, without fw, those of the inherited wrapper;
  // nullopt when neither exists (or the wrapper is a directory).
  std::optional<Data> strokeData() const;

  // Always "public.data", whatever type the drawing was made with.
  std::optional<std::string> fileType() const override;
  // See the table above.
  std::shared_ptr<FileWrapper> fileWrapper() const override;
  std::optional<Data> contents() const override;

  // The drawing's identifier, the base name of its file; nullopt until a file is written.
  const std::optional<std::string>& uuid() const { return uuid_; }
  void setUuid(std::optional<std::string> uuid) { uuid_ = std::move(uuid); }
  // A picture of the drawing kept for the host; the library never sets or reads it.
  const std::shared_ptr<Image>& displayImage() const { return displayImage_; }
  void setDisplayImage(std::shared_ptr<Image> image) { displayImage_ = std::move(image); }
  // The wrapper of the file this drawing wrote.
  const std::shared_ptr<FileWrapper>& fw() const { return fw_; }
  void setFw(std::shared_ptr<FileWrapper> wrapper) { fw_ = std::move(wrapper); }

  bool isKindOfClass(std::string_view className) const override;

 protected:
  // Every way of making a drawing ends here: the data and type are stored, then the file
  // is written and `saving` set to 0. So copying an attachment into a drawing
  // (initWithTextAttachment<RVPencilAttachment>) writes a new file under a new uuid.
  bool initWithDataHook(std::optional<Data> contentData, std::optional<std::string> uti) override;

 private:
  std::optional<std::string> uuid_;
  std::shared_ptr<Image> displayImage_;
  std::shared_ptr<FileWrapper> fw_;
};

}  // namespace corvel
