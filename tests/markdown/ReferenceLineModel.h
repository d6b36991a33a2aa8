// The straightforward line model: split the whole text into lines and walk all of them,
// exactly as the rules read. Slow on big texts, obviously right on small ones; the
// differential test holds the library's fast path to it.
#pragma once

#include <limits>
#include <ostream>
#include <vector>

#include "Corvelbase/MarkdownCommands.h"

namespace corvel::testing {

std::vector<MarkdownCommands::LineItem> referenceLinesForRange(const String& text, Range range);

// `text` with `range` replaced by `replacement`: what an editor does with a command's answer.
String applyEdit(const String& text, Range range, const String& replacement);

}  // namespace corvel::testing

namespace corvel {
namespace md = MarkdownCommands;

// The largest selection location or length: every clamp and overflow guard meets it.
inline constexpr std::uint64_t kMax = std::numeric_limits<std::uint64_t>::max();
// What an out range holds before a call, to tell "left alone" from "written".
inline constexpr Range kUnwritten{12345, 6789};

// Readable failure messages.
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
