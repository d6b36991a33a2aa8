#include "Corvelbase/platform/TextAttachment.h"

namespace corvel {

TextAttachment::~TextAttachment() = default;

std::shared_ptr<TextAttachment> TextAttachment::init() {
  auto attachment = alloc<TextAttachment>();
  return attachment->initHook() ? attachment : nullptr;
}

std::shared_ptr<TextAttachment> TextAttachment::initWithData(std::optional<Data> contentData,
                                                             std::optional<std::string> uti) {
  auto attachment = alloc<TextAttachment>();
  if (!attachment->initWithDataHook(std::move(contentData), std::move(uti))) return nullptr;
  return attachment;
}

std::shared_ptr<TextAttachment> TextAttachment::initWithFileWrapper(
    std::shared_ptr<FileWrapper> wrapper) {
  auto attachment = alloc<TextAttachment>();
  if (!attachment->initWithDataHook(std::nullopt, std::nullopt)) return nullptr;
  attachment->setFileWrapper(std::move(wrapper));
  return attachment;
}

bool TextAttachment::initHook() { return initWithDataHook(std::nullopt, std::nullopt); }

bool TextAttachment::initWithDataHook(std::optional<Data> contentData,
                                      std::optional<std::string> uti) {
  contents_ = std::move(contentData);
  fileType_ = std::move(uti);
  return true;
}

Rect TextAttachment::attachmentBoundsForTextContainer(const TextContainer*, const Rect&,
                                                      const Point&, std::uint64_t) const {
  if (bounds_.size.width != 0 || bounds_.size.height != 0) return bounds_;
  if (auto picture = image()) return Rect(0, 0, picture->size().width, picture->size().height);
  return RectZero;
}

bool TextAttachment::isKindOfClass(std::string_view className) const {
  return className == kTextAttachmentClassName;
}

}  // namespace corvel
