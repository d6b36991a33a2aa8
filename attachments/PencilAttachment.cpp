// RVPencilAttachment: a drawing's stroke data with its own "<uuid>.pencildata" file.
#include "Corvelbase/RVPencilAttachment.h"

#include "Corvelbase/platform/Files.h"

namespace corvel {

const std::string RVPencilAttachmentFileType = "public.data";
const std::string RVPencilDataExtension = "pencildata";

std::shared_ptr<RVPencilAttachment> RVPencilAttachment::init() {
  auto attachment = alloc<RVPencilAttachment>();
  return attachment->initHook() ? attachment : nullptr;
}

std::shared_ptr<RVPencilAttachment> RVPencilAttachment::initWithData(
    std::optional<Data> strokeData, std::optional<std::string> uti) {
  auto attachment = alloc<RVPencilAttachment>();
  if (!attachment->initWithDataHook(std::move(strokeData), std::move(uti))) return nullptr;
  return attachment;
}

bool RVPencilAttachment::initWithDataHook(std::optional<Data> contentData,
                                          std::optional<std::string> uti) {
  if (!RVMXTextAttachment::initWithDataHook(std::move(contentData), std::move(uti))) return false;
  // The file holds the bytes as given, so it is written from what was just stored.
  createFileWrapper(TextAttachment::contents());
  setSaving(kSavingEditing);
  return true;
}

void RVPencilAttachment::createFileWrapper(const std::optional<Data>& strokeData) {
  if (!strokeData) return;
  std::string directory = cachesDirectory();
  if (directory.empty()) return;
  uuid_ = makeUUIDString();
  std::string path = directory + "/" + *uuid_ + "." + RVPencilDataExtension;
  // A failed write shows as a missing file below; the drawing then has no file to give.
  writeFileAtomically(path, *strokeData);
  fw_ = FileWrapper::initWithPath(path);
}

std::optional<Data> RVPencilAttachment::strokeData() const {
  // Read fw_ directly: the overridden fileWrapper() hides it outside writing out.
  auto wrapper = fw_ ? fw_ : TextAttachment::fileWrapper();
  if (!wrapper) return std::nullopt;
  return wrapper->regularFileContents();
}

std::optional<std::string> RVPencilAttachment::fileType() const {
  return RVPencilAttachmentFileType;
}

std::shared_ptr<FileWrapper> RVPencilAttachment::fileWrapper() const {
  if (saving() != kSavingWritingOut) return nullptr;
  return fw_ ? fw_ : TextAttachment::fileWrapper();
}

std::optional<Data> RVPencilAttachment::contents() const {
  if (saving() == kSavingWritingOut) return std::nullopt;
  return TextAttachment::contents();
}

bool RVPencilAttachment::isKindOfClass(std::string_view className) const {
  return className == kRVPencilAttachmentClassName || RVMXTextAttachment::isKindOfClass(className);
}

}  // namespace corvel
