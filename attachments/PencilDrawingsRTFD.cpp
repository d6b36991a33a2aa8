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
  return detail::hasPencilDataExtension(wrapper.preferredFilename()) ||
         detail::hasPencilDataExtension(wrapper.filename());
}

}  // namespace

namespace PencilDrawings {

std::optional<std::string> identifierForAttachment(
    const AttributedString& /*text*/, const std::shared_ptr<TextAttachment>& attachment) {
  auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
  if (!wrapper) return std::nullopt;
  const auto& name =
      wrapper->preferredFilename() ? wrapper->preferredFilename() : wrapper->filename();
  if (!name) return std::nullopt;
  return detail::identifierOfFileName(*name);
}

std::optional<std::string> fileIDForAttachment(const AttributedString& /*text*/,
                                               const std::shared_ptr<TextAttachment>& attachment) {
  auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
  if (!wrapper || !wrapper->filename()) return std::nullopt;
  return detail::identifierOfFileName(*wrapper->filename());
}

PencilAttachmentDictionary removePencilAttachments(AttributedString& text) {
  PencilAttachmentDictionary drawings;
  std::vector<Range> ranges;
  text.enumerateAttribute(AttachmentAttributeName, Range{0, text.length()}, 0,
                          [&](const AttributeValue* value, Range range, bool*) {
                            auto attachment = attachmentIn(value);
                            auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
                            if (!wrapper || !isDrawingFile(*wrapper)) return;
                            if (auto identifier = identifierForAttachment(text, attachment))
                              drawings[*identifier] = attachment;
                            ranges.push_back(range);
                          });
  // Only the attribute goes: the characters stay, so ranges the host holds keep their
  // meaning and the text keeps its length.
  for (auto it = ranges.rbegin(); it != ranges.rend(); ++it)
    text.removeAttribute(AttachmentAttributeName, *it);
  return drawings;
}

void appendPencilAttachments(AttributedString& text,
                             const std::optional<PencilAttachmentDictionary>& pencilAttachments) {
  if (!pencilAttachments) return;
  std::vector<std::shared_ptr<TextAttachment>> noted;
  text.enumerateAttribute(AttachmentAttributeName, Range{0, text.length()}, 0,
                          [&](const AttributeValue* value, Range, bool*) {
                            auto attachment = attachmentIn(value);
                            auto wrapper = attachment ? attachment->fileWrapper() : nullptr;
                            if (!wrapper || (!wrapper->preferredFilename() && !wrapper->filename()))
                              return;
                            auto identifier = identifierForAttachment(text, attachment);
                            if (!identifier) return;
                            auto found = pencilAttachments->find(*identifier);
                            if (found != pencilAttachments->end() && found->second)
                              noted.push_back(found->second);
                          });
  for (const auto& drawing : noted)
    text.appendAttributedString(AttributedString::attributedStringWithAttachment(drawing));
}

void preSaveRTFD(AttributedString& text, Range* range) { preSaveRTFD(text, range, std::nullopt); }

void preSaveRTFD(AttributedString& text, Range*,
                 const std::optional<PencilAttachmentDictionary>& pencilAttachments) {
  if (pencilAttachments && !pencilAttachments->empty())
    appendPencilAttachments(text, pencilAttachments);
}

void postSaveRTFD(AttributedString& text, Range) { removePencilAttachments(text); }

void postLoadDocument(AttributedString&) {}

}  // namespace PencilDrawings
}  // namespace corvel
