// The PencilDrawings category around saving and loading as RTFD: drawings appended for
// the write, and taken out again after it and after loading.
#include <vector>

#include "Corvelbase/PencilDrawings.h"
#include "attachments/PencilPaths.h"

namespace corvel {

namespace {

std::shared_ptr<TextAttachment> attachmentIn(const AttributeValue* value) {
  auto* attachment = value ? std::get_if<std::shared_ptr<TextAttachment>>(value) : nullptr;
  return attachment ? *attachment : nullptr;
}

bool isDrawingFile(const FileWrapper& wrapper) {
  return pencil::hasPencilDataExtension(wrapper.preferredFilename()) ||
         pencil::hasPencilDataExtension(wrapper.filename());
}

}  // namespace

std::optional<std::string> AttributedString::identifierForAttachment(
    const std::shared_ptr<TextAttachment>& attachment) const {
  auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
  if (!wrapper) return std::nullopt;
  const auto& name =
      wrapper->preferredFilename() ? wrapper->preferredFilename() : wrapper->filename();
  if (!name) return std::nullopt;
  return pencil::identifierOfFileName(*name);
}

std::optional<std::string> AttributedString::fileIDForAttachment(
    const std::shared_ptr<TextAttachment>& attachment) const {
  auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
  if (!wrapper || !wrapper->filename()) return std::nullopt;
  return pencil::identifierOfFileName(*wrapper->filename());
}

PencilAttachmentDictionary AttributedString::removePencilAttachments() {
  PencilAttachmentDictionary drawings;
  std::vector<Range> ranges;
  enumerateAttribute(AttachmentAttributeName, Range{0, length()}, 0,
                     [&](const AttributeValue* value, Range range, bool*) {
                       auto attachment = attachmentIn(value);
                       auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
                       if (!wrapper || !isDrawingFile(*wrapper)) return;
                       if (auto identifier = identifierForAttachment(attachment))
                         drawings[*identifier] = attachment;
                       ranges.push_back(range);
                     });
  // Only the attribute goes: the characters stay, so ranges the host holds keep their
  // meaning and the text keeps its length.
  for (auto it = ranges.rbegin(); it != ranges.rend(); ++it)
    removeAttribute(AttachmentAttributeName, *it);
  return drawings;
}

void AttributedString::appendPencilAttachments(
    const std::optional<PencilAttachmentDictionary>& pencilAttachments) {
  if (!pencilAttachments) return;
  std::vector<std::shared_ptr<TextAttachment>> noted;
  enumerateAttribute(AttachmentAttributeName, Range{0, length()}, 0,
                     [&](const AttributeValue* value, Range, bool*) {
                       auto attachment = attachmentIn(value);
                       auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
                       if (!wrapper || (!wrapper->preferredFilename() && !wrapper->filename()))
                         return;
                       auto identifier = identifierForAttachment(attachment);
                       if (!identifier) return;
                       auto found = pencilAttachments->find(*identifier);
                       if (found != pencilAttachments->end() && found->second)
                         noted.push_back(found->second);
                     });
  for (const auto& drawing : noted) appendAttributedString(attributedStringWithAttachment(drawing));
}

void AttributedString::preSaveRTFD(Range* range) { preSaveRTFD(range, std::nullopt); }

void AttributedString::preSaveRTFD(
    Range*, const std::optional<PencilAttachmentDictionary>& pencilAttachments) {
  if (pencilAttachments && !pencilAttachments->empty()) appendPencilAttachments(pencilAttachments);
}

void AttributedString::postSaveRTFD(Range) { removePencilAttachments(); }

void AttributedString::postLoadDocument() {}

}  // namespace corvel
