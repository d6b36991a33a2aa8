// Attributed strings: UTF-16 text with attribute runs.
//
// Every character carries a dictionary of named attributes; consecutive characters with
// equal dictionaries form a run. The attachment attribute (`AttachmentAttributeName`)
// holds a TextAttachment and stands on an attachment character (U+FFFC). Attribute
// values compare by value, attachments by identity.
//
// An AttributedString is a value: copying copies the text and the runs, and the copy
// shares the attachment objects (as the platform's copies do). Not locked.
//
// Ranges count UTF-16 code units. Out-of-bounds ranges have a defined answer:
// - readers (attribute queries, enumeration, substrings) work on the part of the range
//   that lies inside the text; an index at or past the end finds no attributes and
//   reports NotFoundRange as its effective range;
// - editors (add, set, remove, replace, delete, insert) do nothing and return false when
//   the range does not lie wholly inside the text (location + length <= length()).
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

class TextAttachment;
class Image;

using AttributeValue =
    std::variant<bool, std::int64_t, double, String, Data, std::shared_ptr<TextAttachment>>;
using Attributes = std::map<std::string, AttributeValue>;

// The attribute that holds a character's TextAttachment.
CORVEL_EXPORT extern const std::string AttachmentAttributeName;
// The character an attachment stands on.
inline constexpr char16_t AttachmentCharacter = u'\uFFFC';

// ---- Category PencilDrawings: its dictionaries (see Corvelbase/PencilDrawings.h) ----

// Drawing identifier (UTF-8) to stroke data: what goes to the pasteboard.
using PencilDataDictionary = std::map<std::string, Data>;
// Drawing identifier to drawing attachment: what the host keeps between load and save.
using PencilAttachmentDictionary = std::map<std::string, std::shared_ptr<TextAttachment>>;

// Options of the enumerations.
enum AttributedStringEnumerationOptions : std::uint32_t {
  AttributedStringEnumerationReverse = 1u << 1,
  AttributedStringEnumerationLongestEffectiveRangeNotRequired = 1u << 20,
};

class CORVEL_EXPORT AttributedString {
 public:
  // The block gets the attributes (or the one attribute's value, nullptr when the range
  // lacks it), their range and a flag to set for stopping.
  using AttributesBlock =
      std::function<void(const Attributes& attributes, Range range, bool* stop)>;
  using AttributeBlock = std::function<void(const AttributeValue* value, Range range, bool* stop)>;

  AttributedString() = default;
  explicit AttributedString(String text, const Attributes& attributes = {});
  // One attachment character carrying `attachment` (a null attachment gives a plain
  // U+FFFC).
  static AttributedString attributedStringWithAttachment(
      std::shared_ptr<TextAttachment> attachment);

  const String& string() const { return text_; }
  std::uint64_t length() const { return text_.size(); }

  // The attributes at `index`, and in `effectiveRange` (if given) the run that holds
  // them. Past the end: empty, NotFoundRange.
  Attributes attributesAtIndex(std::uint64_t index, Range* effectiveRange) const;
  // The same, with the longest range of equal attributes around `index` within
  // `rangeLimit`.
  Attributes attributesAtIndex(std::uint64_t index, Range* longestEffectiveRange,
                               Range rangeLimit) const;
  // The value of one attribute at `index` (nullopt when absent), and in
  // `effectiveRange` the range over which that value holds (absence included).
  std::optional<AttributeValue> attribute(const std::string& name, std::uint64_t index,
                                          Range* effectiveRange) const;
  std::optional<AttributeValue> attribute(const std::string& name, std::uint64_t index,
                                          Range* longestEffectiveRange, Range rangeLimit) const;
  // The attachment at `index`, or nullptr.
  std::shared_ptr<TextAttachment> attachmentAtIndex(std::uint64_t index) const;

  // Calls `block` for each run of attributes in `range`, in text order or backwards
  // with AttributedStringEnumerationReverse. Runs are always the longest ranges of equal
  // attributes, so LongestEffectiveRangeNotRequired changes nothing here. The block may
  // edit the string: the runs were taken before the first call.
  void enumerateAttributesInRange(Range range, std::uint32_t options,
                                  const AttributesBlock& block) const;
  // Calls `block` for each range in `range` over which attribute `name` has one value
  // (or is absent). Without LongestEffectiveRangeNotRequired, neighbouring runs with the
  // same value are merged; with it, the block may see them one run at a time.
  void enumerateAttribute(const std::string& name, Range range, std::uint32_t options,
                          const AttributeBlock& block) const;

  // The characters and attributes of `range` (clamped to the text).
  AttributedString attributedSubstringFromRange(Range range) const;

  bool addAttribute(const std::string& name, AttributeValue value, Range range);
  bool addAttributes(const Attributes& attributes, Range range);
  bool setAttributes(const Attributes& attributes, Range range);
  bool removeAttribute(const std::string& name, Range range);

  // Replaces the characters of `range`. Plain text takes the attributes of the first
  // replaced character, or, for an empty range, of the character before (else after).
  bool replaceCharactersInRange(Range range, const String& text);
  bool replaceCharactersInRange(Range range, const AttributedString& text);
  bool insertAttributedString(const AttributedString& text, std::uint64_t location);
  void appendAttributedString(const AttributedString& text);
  bool deleteCharactersInRange(Range range);

  // Editing batches nest; neighbouring runs that became equal are merged when the
  // outermost batch ends (outside a batch, after each edit). Results of the readers are
  // the same inside and outside a batch. An unmatched endEditing does nothing.
  void beginEditing();
  void endEditing();
  bool isEditing() const { return editing_ > 0; }

  // Equal text and equal attributes on every character.
  friend CORVEL_EXPORT bool operator==(const AttributedString& a, const AttributedString& b);

  // ---- Category PencilDrawings (attachments/PencilDrawings*.cpp) ----
  //
  // Pencil drawings through insertion, cut, copy, paste, saving and loading. The host
  // calls these around its own operations; Corvelbase/PencilDrawings.h describes the life
  // of a drawing and what the host does at each step. A drawing's identifier is the base
  // name of its files (last path component without extension): "<uuid>" for both
  // "<uuid>.jpeg" and "<uuid>.pencildata". Call on the thread that edits the text.

  // Replaces `range` (in one editing batch) with one attachment character holding a new
  // RVMXScaledImageAttachment of `image` whose drawing is a new RVPencilAttachment of
  // `pencilData` (type "public.data"); this writes "<uuid>.pencildata" and "<uuid>.jpeg"
  // into the caches directory. A range not wholly inside the text changes nothing and
  // writes no file.
  void insertImage(const std::shared_ptr<Image>& image, const std::optional<Data>& pencilData,
                   Range range);
  // Identifier to stroke data of every drawing in `range` (clamped): each
  // RVMXScaledImageAttachment with a pencilAttachment, keyed by the identifier of the
  // filename of the picture's fileWrapper() as it answers now (its own "<uuid>.jpeg" at
  // `saving` 1, hence preCutOrCopy). Pictures without a wrapper or filename are skipped;
  // a later drawing under the same identifier replaces an earlier one, and one without
  // stroke data removes the entry.
  PencilDataDictionary pencilDataDictionaryForRange(Range range) const;
  // Before the host's cut or copy of `range`: every RVMXTextAttachment in it gets
  // `saving` 1, then pencilDataDict becomes pencilDataDictionaryForRange(range).
  void preCutOrCopy(Range range) const;
  // After the host's cut or copy: addPencilDataToClipboard(pencilDataDict); then, only
  // when `range` still lies wholly inside the text, every RVMXTextAttachment in it gets
  // `saving` 0 (after a cut that shortened the text past the range's end the cut
  // attachments keep `saving` 1, as accepted behaviour); last, pencilDataDict is cleared.
  void postCutOrCopy(Range range) const;
  // Sets the keyed archive of `pencilData` on the general pasteboard under
  // RVPencilPasteboardData, beside the types already there. Nothing for an absent or
  // empty dictionary. When archiving fails it logs "Failed to copy pencil data to
  // clipboard: <reason>" and writes nothing; a backend that refuses the data is not
  // reported.
  void addPencilDataToClipboard(const std::optional<PencilDataDictionary>& pencilData) const;
  // Reads the general pasteboard's RVPencilPasteboardData item into
  // pastedPencilDataDictionary: nothing changes when there is no such item; an item that
  // is no keyed archive of a dictionary of strings to data (wrong classes, cycles,
  // truncation, any other bytes) sets it to nullopt, silently.
  void checkForPencilDataOnPaste() const;
  // Takes the drawings out of a loaded text: every attachment whose file wrapper's
  // preferredFilename, or failing that its filename, has the extension "pencildata"
  // (exactly; "a.PENCILDATA" is not a drawing) loses its attachment attribute. The
  // characters stay in the text as plain U+FFFC, so the length does not change. Returns
  // identifierForAttachment to attachment (a later one under the same identifier wins).
  PencilAttachmentDictionary removePencilAttachments();
  // The identifier of the attachment's file wrapper's preferredFilename when it has one,
  // else of its filename; nullopt without an attachment, wrapper or name.
  std::optional<std::string> identifierForAttachment(
      const std::shared_ptr<TextAttachment>& attachment) const;
  // The identifier of the wrapper's filename only (never preferredFilename, unlike
  // identifierForAttachment); nullopt without an attachment, wrapper or filename.
  std::optional<std::string> fileIDForAttachment(
      const std::shared_ptr<TextAttachment>& attachment) const;
  // For every attachment run in text order whose attachment's wrapper has a name and
  // whose identifier is a key of `pencilAttachments`, appends that drawing as one
  // attachment character at the end of the text (a picture standing twice appends its
  // drawing twice). Keys matching nothing, or no dictionary, leave the text unchanged.
  void appendPencilAttachments(const std::optional<PencilAttachmentDictionary>& pencilAttachments);
  // Before the host writes the text as RTFD: appendPencilAttachments when
  // `pencilAttachments` is present and not empty. `range` is neither read nor written
  // (it may be nullptr); the form without a dictionary changes nothing.
  void preSaveRTFD(Range* range);
  void preSaveRTFD(Range* range,
                   const std::optional<PencilAttachmentDictionary>& pencilAttachments);
  // After the write: removePencilAttachments, its result dropped. `range` is not used.
  void postSaveRTFD(Range range);
  // After the host loaded a document: nothing; a hook kept for the host.
  void postLoadDocument();

 private:
  struct Run {
    std::uint64_t length;
    Attributes attributes;
  };
  // Splits runs so that one starts at `index` (<= length()); returns its position.
  std::size_t splitAt(std::uint64_t index);
  void coalesce();
  bool inBounds(Range range) const;
  template <class Edit>
  bool editAttributes(Range range, Edit edit);
  // Copies of the runs inside `range` (clamped), cut to it.
  std::vector<std::pair<Range, Attributes>> runsIn(Range range) const;

  String text_;
  std::vector<Run> runs_;
  int editing_ = 0;
};

}  // namespace corvel
