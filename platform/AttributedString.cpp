#include "Corvelbase/platform/AttributedString.h"

#include <algorithm>

#include "Corvelbase/platform/TextAttachment.h"

namespace corvel {

const std::string AttachmentAttributeName = "NSAttachment";

namespace {

Range clamp(Range range, std::uint64_t length) {
  std::uint64_t location = std::min(range.location, length);
  return {location, std::min(range.length, length - location)};
}

std::optional<AttributeValue> valueIn(const Attributes& attributes, const std::string& name) {
  auto it = attributes.find(name);
  if (it == attributes.end()) return std::nullopt;
  return it->second;
}

}  // namespace

AttributedString::AttributedString(String text, const Attributes& attributes)
    : text_(std::move(text)) {
  if (!text_.empty()) runs_.push_back({text_.size(), attributes});
}

AttributedString AttributedString::attributedStringWithAttachment(
    std::shared_ptr<TextAttachment> attachment) {
  Attributes attributes;
  if (attachment) attributes.emplace(AttachmentAttributeName, std::move(attachment));
  return AttributedString(String(1, AttachmentCharacter), attributes);
}

bool AttributedString::inBounds(Range range) const {
  return range.location <= length() && range.length <= length() - range.location;
}

std::size_t AttributedString::splitAt(std::uint64_t index) {
  if (index >= length()) return runs_.size();  // appending stays cheap
  std::uint64_t start = 0;
  for (std::size_t i = 0; i < runs_.size(); ++i) {
    if (start == index) return i;
    std::uint64_t end = start + runs_[i].length;
    if (index < end) {
      Run tail{end - index, runs_[i].attributes};
      runs_[i].length = index - start;
      runs_.insert(runs_.begin() + static_cast<std::ptrdiff_t>(i) + 1, std::move(tail));
      return i + 1;
    }
    start = end;
  }
  return runs_.size();
}

void AttributedString::coalesce() {
  if (editing_ > 0) return;
  std::vector<Run> merged;
  merged.reserve(runs_.size());
  for (auto& run : runs_) {
    if (run.length == 0) continue;
    if (!merged.empty() && merged.back().attributes == run.attributes)
      merged.back().length += run.length;
    else
      merged.push_back(std::move(run));
  }
  runs_ = std::move(merged);
}

std::vector<std::pair<Range, Attributes>> AttributedString::runsIn(Range range) const {
  range = clamp(range, length());
  std::vector<std::pair<Range, Attributes>> result;
  std::uint64_t start = 0, stop = range.max();
  for (const auto& run : runs_) {
    std::uint64_t end = start + run.length;
    std::uint64_t from = std::max(start, range.location), to = std::min(end, stop);
    if (from < to) result.push_back({Range{from, to - from}, run.attributes});
    if (end >= stop) break;
    start = end;
  }
  return result;
}

Attributes AttributedString::attributesAtIndex(std::uint64_t index, Range* effectiveRange) const {
  std::uint64_t start = 0;
  for (const auto& run : runs_) {
    if (index < start + run.length) {
      if (effectiveRange) *effectiveRange = {start, run.length};
      return run.attributes;
    }
    start += run.length;
  }
  if (effectiveRange) *effectiveRange = NotFoundRange;
  return {};
}

Attributes AttributedString::attributesAtIndex(std::uint64_t index, Range* longestEffectiveRange,
                                               Range rangeLimit) const {
  rangeLimit = clamp(rangeLimit, length());
  if (index >= length()) {
    if (longestEffectiveRange) *longestEffectiveRange = NotFoundRange;
    return {};
  }
  Attributes here = attributesAtIndex(index, nullptr);
  if (longestEffectiveRange) {
    auto runs = runsIn(rangeLimit);
    *longestEffectiveRange = {index, 0};
    for (std::size_t i = 0; i < runs.size(); ++i) {
      if (index < runs[i].first.location || index >= runs[i].first.max()) continue;
      std::size_t first = i, last = i;
      while (first > 0 && runs[first - 1].second == here) --first;
      while (last + 1 < runs.size() && runs[last + 1].second == here) ++last;
      std::uint64_t from = runs[first].first.location;
      *longestEffectiveRange = {from, runs[last].first.max() - from};
    }
  }
  return here;
}

std::optional<AttributeValue> AttributedString::attribute(const std::string& name,
                                                          std::uint64_t index,
                                                          Range* effectiveRange) const {
  return attribute(name, index, effectiveRange, Range{0, length()});
}

std::optional<AttributeValue> AttributedString::attribute(const std::string& name,
                                                          std::uint64_t index,
                                                          Range* longestEffectiveRange,
                                                          Range rangeLimit) const {
  if (index >= length()) {
    if (longestEffectiveRange) *longestEffectiveRange = NotFoundRange;
    return std::nullopt;
  }
  auto here = valueIn(attributesAtIndex(index, nullptr), name);
  if (longestEffectiveRange) {
    auto runs = runsIn(rangeLimit);
    *longestEffectiveRange = {index, 0};
    for (std::size_t i = 0; i < runs.size(); ++i) {
      if (index < runs[i].first.location || index >= runs[i].first.max()) continue;
      std::size_t first = i, last = i;
      while (first > 0 && valueIn(runs[first - 1].second, name) == here) --first;
      while (last + 1 < runs.size() && valueIn(runs[last + 1].second, name) == here) ++last;
      std::uint64_t from = runs[first].first.location;
      *longestEffectiveRange = {from, runs[last].first.max() - from};
    }
  }
  return here;
}

std::shared_ptr<TextAttachment> AttributedString::attachmentAtIndex(std::uint64_t index) const {
  auto value = attribute(AttachmentAttributeName, index, nullptr);
  if (!value) return nullptr;
  auto* attachment = std::get_if<std::shared_ptr<TextAttachment>>(&*value);
  return attachment ? *attachment : nullptr;
}

void AttributedString::enumerateAttributesInRange(Range range, std::uint32_t options,
                                                  const AttributesBlock& block) const {
  auto runs = runsIn(range);
  // Inside an editing batch runs may not be merged yet; the block sees merged ones.
  std::vector<std::pair<Range, Attributes>> merged;
  for (auto& run : runs) {
    if (!merged.empty() && merged.back().second == run.second)
      merged.back().first.length += run.first.length;
    else
      merged.push_back(std::move(run));
  }
  if (options & AttributedStringEnumerationReverse) std::reverse(merged.begin(), merged.end());
  bool stop = false;
  for (const auto& [runRange, attributes] : merged) {
    block(attributes, runRange, &stop);
    if (stop) break;
  }
}

void AttributedString::enumerateAttribute(const std::string& name, Range range,
                                          std::uint32_t options,
                                          const AttributeBlock& block) const {
  std::vector<std::pair<Range, std::optional<AttributeValue>>> pieces;
  bool merge = !(options & AttributedStringEnumerationLongestEffectiveRangeNotRequired);
  for (auto& [runRange, attributes] : runsIn(range)) {
    auto value = valueIn(attributes, name);
    if (merge && !pieces.empty() && pieces.back().second == value)
      pieces.back().first.length += runRange.length;
    else
      pieces.push_back({runRange, std::move(value)});
  }
  if (options & AttributedStringEnumerationReverse) std::reverse(pieces.begin(), pieces.end());
  bool stop = false;
  for (const auto& [pieceRange, value] : pieces) {
    block(value ? &*value : nullptr, pieceRange, &stop);
    if (stop) break;
  }
}

AttributedString AttributedString::attributedSubstringFromRange(Range range) const {
  range = clamp(range, length());
  AttributedString result;
  result.text_ = text_.substr(range.location, range.length);
  for (auto& [runRange, attributes] : runsIn(range))
    result.runs_.push_back({runRange.length, std::move(attributes)});
  return result;
}

template <class Edit>
bool AttributedString::editAttributes(Range range, Edit edit) {
  if (!inBounds(range)) return false;
  if (range.length == 0) return true;
  std::size_t first = splitAt(range.location);
  std::size_t last = splitAt(range.max());
  for (std::size_t i = first; i < last; ++i) edit(runs_[i].attributes);
  coalesce();
  return true;
}

bool AttributedString::addAttribute(const std::string& name, AttributeValue value, Range range) {
  return editAttributes(range, [&](Attributes& a) { a[name] = value; });
}

bool AttributedString::addAttributes(const Attributes& attributes, Range range) {
  return editAttributes(range, [&](Attributes& a) {
    for (const auto& [name, value] : attributes) a[name] = value;
  });
}

bool AttributedString::setAttributes(const Attributes& attributes, Range range) {
  return editAttributes(range, [&](Attributes& a) { a = attributes; });
}

bool AttributedString::removeAttribute(const std::string& name, Range range) {
  return editAttributes(range, [&](Attributes& a) { a.erase(name); });
}

bool AttributedString::replaceCharactersInRange(Range range, const String& text) {
  if (!inBounds(range)) return false;
  Attributes attributes;
  if (range.length > 0 || range.location > 0 || length() > 0) {
    std::uint64_t from = range.length > 0     ? range.location
                         : range.location > 0 ? range.location - 1
                                              : 0;
    attributes = attributesAtIndex(from, nullptr);
  }
  return replaceCharactersInRange(range, AttributedString(text, attributes));
}

bool AttributedString::replaceCharactersInRange(Range range, const AttributedString& text) {
  if (!inBounds(range)) return false;
  if (&text == this) return replaceCharactersInRange(range, AttributedString(text));
  std::size_t first = splitAt(range.location);
  std::size_t last = splitAt(range.max());
  runs_.erase(runs_.begin() + static_cast<std::ptrdiff_t>(first),
              runs_.begin() + static_cast<std::ptrdiff_t>(last));
  runs_.insert(runs_.begin() + static_cast<std::ptrdiff_t>(first), text.runs_.begin(),
               text.runs_.end());
  text_.replace(range.location, range.length, text.text_);
  coalesce();
  return true;
}

bool AttributedString::insertAttributedString(const AttributedString& text,
                                              std::uint64_t location) {
  return replaceCharactersInRange(Range{location, 0}, text);
}

void AttributedString::appendAttributedString(const AttributedString& text) {
  replaceCharactersInRange(Range{length(), 0}, text);
}

bool AttributedString::deleteCharactersInRange(Range range) {
  return replaceCharactersInRange(range, AttributedString());
}

void AttributedString::beginEditing() { ++editing_; }

void AttributedString::endEditing() {
  if (editing_ == 0) return;
  --editing_;
  coalesce();
}

bool operator==(const AttributedString& a, const AttributedString& b) {
  if (a.text_ != b.text_) return false;
  // Walk both run lists together; they may be cut differently inside a batch.
  std::size_t i = 0, j = 0;
  std::uint64_t usedA = 0, usedB = 0;
  while (i < a.runs_.size() && j < b.runs_.size()) {
    if (a.runs_[i].attributes != b.runs_[j].attributes) return false;
    std::uint64_t step = std::min(a.runs_[i].length - usedA, b.runs_[j].length - usedB);
    usedA += step;
    usedB += step;
    if (usedA == a.runs_[i].length) ++i, usedA = 0;
    if (usedB == b.runs_[j].length) ++j, usedB = 0;
  }
  return true;
}

}  // namespace corvel
