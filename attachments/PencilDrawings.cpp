// The PencilDrawings category: inserting drawings, and carrying them through cut, copy
// and paste on the general pasteboard.
#include "Corvelbase/PencilDrawings.h"

#include "Corvelbase/platform/KeyedArchive.h"
#include "Corvelbase/platform/Log.h"
#include "Corvelbase/platform/Pasteboard.h"
#include "attachments/PencilPaths.h"

namespace corvel {

const std::string RVPencilPasteboardData = "com.corvelwrks.pencildata";
const std::string RVPencilClipboardFailurePrefix = "Failed to copy pencil data to clipboard: ";

std::optional<PencilDataDictionary> pencilDataDict;
std::optional<PencilDataDictionary> pastedPencilDataDictionary;

namespace {

// Sets `saving` on every library attachment standing in `range` of `text`.
void setSavingInRange(const AttributedString& text, Range range, std::int64_t saving) {
  text.enumerateAttribute(
      AttachmentAttributeName, range, 0, [&](const AttributeValue* value, Range, bool*) {
        auto* attachment = value ? std::get_if<std::shared_ptr<TextAttachment>>(value) : nullptr;
        if (!attachment) return;
        if (auto own = std::dynamic_pointer_cast<RVMXTextAttachment>(*attachment))
          own->setSaving(saving);
      });
}

bool inBounds(const AttributedString& text, Range range) {
  return range.location <= text.length() && range.length <= text.length() - range.location;
}

}  // namespace

namespace PencilDrawings {

void insertImage(AttributedString& text, const std::shared_ptr<Image>& image,
                 const std::optional<Data>& pencilData, Range range) {
  // Checked first so that a refused edit leaves no stray files behind.
  if (!inBounds(text, range)) return;
  text.beginEditing();
  auto drawing = RVPencilAttachment::initWithData(pencilData, RVPencilAttachmentFileType);
  auto picture = RVMXScaledImageAttachment::initWithImage(image, drawing);
  text.replaceCharactersInRange(range, AttributedString::attributedStringWithAttachment(picture));
  text.endEditing();
}

PencilDataDictionary pencilDataDictionaryForRange(const AttributedString& text, Range range) {
  PencilDataDictionary dictionary;
  text.enumerateAttributesInRange(
      range, AttributedStringEnumerationLongestEffectiveRangeNotRequired,
      [&](const Attributes& attributes, Range, bool*) {
        for (const auto& [name, value] : attributes) {
          if (name != AttachmentAttributeName) continue;
          auto* attachment = std::get_if<std::shared_ptr<TextAttachment>>(&value);
          auto picture = attachment
                             ? std::dynamic_pointer_cast<RVMXScaledImageAttachment>(*attachment)
                             : nullptr;
          if (!picture || !picture->pencilAttachment()) continue;
          auto strokes = picture->pencilAttachment()->strokeData();
          auto wrapper = picture->fileWrapper();
          if (!wrapper || !wrapper->filename()) continue;
          std::string identifier = detail::identifierOfFileName(*wrapper->filename());
          if (strokes)
            dictionary[identifier] = std::move(*strokes);
          else
            dictionary.erase(identifier);
        }
      });
  return dictionary;
}

void preCutOrCopy(const AttributedString& text, Range range) {
  setSavingInRange(text, range, kSavingWritingOut);
  pencilDataDict = pencilDataDictionaryForRange(text, range);
}

void postCutOrCopy(const AttributedString& text, Range range) {
  addPencilDataToClipboard(text, pencilDataDict);
  // After a cut the range may now run past the end; the cut attachments then keep
  // `saving` 1. A clamped range would reset attachments that were never cut.
  if (inBounds(text, range)) setSavingInRange(text, range, kSavingEditing);
  pencilDataDict.reset();
}

void addPencilDataToClipboard(const AttributedString& /*text*/,
                              const std::optional<PencilDataDictionary>& pencilData) {
  if (!pencilData || pencilData->empty()) return;
  std::string error;
  auto archive = KeyedArchive::archiveDictionary(*pencilData, &error);
  if (!archive) {
    logMessage(RVPencilClipboardFailurePrefix + error);
    return;
  }
  // setData adds the type beside what the text system wrote; nothing is declared anew.
  Pasteboard::general()->setData(*archive, RVPencilPasteboardData);
}

void checkForPencilDataOnPaste(const AttributedString& /*text*/) {
  auto item = Pasteboard::general()->dataForType(RVPencilPasteboardData);
  if (!item) return;
  pastedPencilDataDictionary = KeyedArchive::unarchiveDictionary(*item);
}

}  // namespace PencilDrawings
}  // namespace corvel
