#include "Corvelbase/RVMXTextAttachment.h"

namespace corvel {

std::shared_ptr<RVMXTextAttachment> RVMXTextAttachment::init() {
  auto attachment = alloc<RVMXTextAttachment>();
  return attachment->initHook() ? attachment : nullptr;
}

std::shared_ptr<RVMXTextAttachment> RVMXTextAttachment::initWithData(
    std::optional<Data> contentData, std::optional<std::string> uti) {
  auto attachment = alloc<RVMXTextAttachment>();
  if (!attachment->initWithDataHook(std::move(contentData), std::move(uti))) return nullptr;
  return attachment;
}

bool RVMXTextAttachment::isKindOfClass(std::string_view className) const {
  return className == kRVMXTextAttachmentClassName || TextAttachment::isKindOfClass(className);
}

}  // namespace corvel
