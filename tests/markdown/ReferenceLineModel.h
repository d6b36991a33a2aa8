// The straightforward line model: split the whole text into lines and walk all of them,
// exactly as the rules read. Slow on big texts, obviously right on small ones; the
// differential test holds the library's fast path to it.
#pragma once

#include <ostream>
#include <vector>

#include "Corvelbase/MarkdownCommands.h"

namespace corvel::testing {

std::vector<MarkdownCommands::LineItem> referenceLinesForRange(const String& text, Range range);

// `text` with `range` replaced by `replacement`: what an editor does with a command's answer.
String applyEdit(const String& text, Range range, const String& replacement);

}  // namespace corvel::testing

// Readable failure messages.
namespace corvel {
inline void PrintTo(const Range& r, std::ostream* os) {
  *os << "(" << r.location << ", " << r.length << ")";
}
namespace MarkdownCommands {
inline void PrintTo(const LineItem& item, std::ostream* os) {
  *os << "{\"" << toUTF8(item.line) << "\" at ";
  corvel::PrintTo(item.range, os);
  *os << "}";
}
}  // namespace MarkdownCommands
}  // namespace corvel
