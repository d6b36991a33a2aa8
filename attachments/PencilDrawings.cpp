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

}  // namespace

void AttributedString::insertImage(const std::shared_ptr<Image>& image,
                                   const std::optional<Data>& pencilData, Range range) {
  // Checked first so that a refused edit leaves no stray files behind.
  if (!inBounds(range)) return;
  beginEditing();
  auto drawing = RVPencilAttachment::initWithData(pencilData, RVPencilAttachmentFileType);
  auto picture = RVMXScaledImageAttachment::initWithImage(image, drawing);
  replaceCharactersInRange(range, attributedStringWithAttachment(picture));
  endEditing();
}

PencilDataDictionary AttributedString::pencilDataDictionaryForRange(Range range) const {
  PencilDataDictionary dictionary;
  enumerateAttributesInRange(
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
          std::string identifier = pencil::identifierOfFileName(*wrapper->filename());
          if (strokes)
            dictionary[identifier] = std::move(*strokes);
          else
            dictionary.erase(identifier);
        }
      });
  return dictionary;
}

void AttributedString::preCutOrCopy(Range range) const {
  setSavingInRange(*this, range, kSavingWritingOut);
  pencilDataDict = pencilDataDictionaryForRange(range);
}

void AttributedString::postCutOrCopy(Range range) const {
  addPencilDataToClipboard(pencilDataDict);
  // After a cut the range may now run past the end; the cut attachments then keep
  // `saving` 1. A clamped range would reset attachments that were never cut.
  if (inBounds(range)) setSavingInRange(*this, range, kSavingEditing);
  pencilDataDict.reset();
}

void AttributedString::addPencilDataToClipboard(
    const std::optional<PencilDataDictionary>& pencilData) const {
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

void AttributedString::checkForPencilDataOnPaste() const {
  auto item = Pasteboard::general()->dataForType(RVPencilPasteboardData);
  if (!item) return;
  pastedPencilDataDictionary = KeyedArchive::unarchiveDictionary(*item);
}

}  // namespace corvel
