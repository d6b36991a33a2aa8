#include "markdown/Selection.h"

#include <algorithm>

namespace corvel::detail {

Range clampToText(const String& text, Range range) {
  std::uint64_t size = text.size();
  std::uint64_t location = std::min(range.location, size);
  return Range{location, std::min(range.length, size - location)};
}

String substring(const String& text, Range range) {
  return text.substr(static_cast<std::size_t>(range.location),
                     static_cast<std::size_t>(range.length));
}

SelectionTracker::SelectionTracker(Range selection, std::uint64_t firstLineLocation)
    : location_(static_cast<std::int64_t>(selection.location)),
      length_(static_cast<std::int64_t>(selection.length)),
      end_(location_ + length_),
      firstLineLocation_(static_cast<std::int64_t>(firstLineLocation)),
      start_(location_),
      carriedLength_(length_) {}

void SelectionTracker::lineRewritten(Range lineRange, std::uint64_t newLineLength,
                                     std::uint64_t outputLength) {
  const auto lineStart = static_cast<std::int64_t>(lineRange.location);
  const auto lineEnd = lineStart + static_cast<std::int64_t>(lineRange.length);
  const auto newLength = static_cast<std::int64_t>(newLineLength);

  // The start moves with its line's end, except that a non-empty selection from a line
  // start keeps that start so that it takes in an inserted prefix.
  bool startInLine = lineStart <= location_ && location_ < lineEnd;
  if (startInLine && (location_ != lineStart || length_ == 0)) {
    start_ = std::max(lineStart, location_ - (lineEnd - lineStart) + newLength);
  }
  // The end keeps its distance from the end of its line in the new text.
  if (carriedLength_ == 0) return;
  bool endInLine = (lineStart <= end_ && end_ < lineEnd) || end_ == lineEnd;
  if (endInLine) {
    std::int64_t newEnd =
        end_ - lineEnd + firstLineLocation_ + static_cast<std::int64_t>(outputLength);
    carriedLength_ = std::max<std::int64_t>(0, newEnd - start_);
  }
}

Range SelectionTracker::selection() const {
  return Range{static_cast<std::uint64_t>(start_), static_cast<std::uint64_t>(carriedLength_)};
}

}  // namespace corvel::detail
