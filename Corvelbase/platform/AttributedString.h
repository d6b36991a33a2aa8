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
  // `rangeLimit` (clamped to the text); {index, 0} when `index` lies outside the limit.
  Attributes attributesAtIndex(std::uint64_t index, Range* longestEffectiveRange,
                               Range rangeLimit) const;
  // The value of one attribute at `index` (nullopt when absent), and in
  // `effectiveRange` the longest range over which that value holds (absence included);
  // the second form looks only within `rangeLimit`, as above.
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
