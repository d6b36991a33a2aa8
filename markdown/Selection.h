// Helpers the Markdown commands share: clamping a selection to the text and carrying a
// selection through a rewrite of the lines it touches. Internal to the library.
#pragma once

#include <cstdint>

#include "Corvelbase/platform/String.h"

namespace corvel::detail {

// `range` cut to the text: the location at most the text's length, the length at most
// what remains after the location. Never overflows.
Range clampToText(const String& text, Range range);

// The text's units in `range`, which must already be clamped to it.
String substring(const String& text, Range range);

// Carries a selection through a walk that rewrites the touched lines one by one and
// appends them to an output. Arithmetic is exact (signed, 64-bit; texts are far shorter
// than 2^62 units): the start never goes before its line's start and a length that would
// come out negative is 0.
class SelectionTracker {
 public:
  // `selection` is clamped; `firstLineLocation` is where the replacement starts.
  SelectionTracker(Range selection, std::uint64_t firstLineLocation);

  // After a line at `lineRange` became a line of `newLineLength` units and the output
  // grew to `outputLength` units.
  void lineRewritten(Range lineRange, std::uint64_t newLineLength, std::uint64_t outputLength);

  Range selection() const;

 private:
  std::int64_t location_;
  std::int64_t length_;
  std::int64_t end_;
  std::int64_t firstLineLocation_;
  std::int64_t start_;
  std::int64_t carriedLength_;
};

}  // namespace corvel::detail
