#include "Corvelbase/platform/CJK.h"

namespace corvel {

namespace {

struct CodeRange {
  char32_t first;
  char32_t last;
};

// Sorted, non-overlapping; see the header for what each range is.
constexpr CodeRange kCJKRanges[] = {
    {0x1100, 0x11FF}, {0x2E80, 0x2FDF}, {0x2FF0, 0x2FFF},   {0x3001, 0x303F},   {0x3040, 0x30FF},
    {0x3100, 0x312F}, {0x3130, 0x318F}, {0x3190, 0x31FF},   {0x3200, 0x33FF},   {0x3400, 0x4DBF},
    {0x4E00, 0x9FFF}, {0xA960, 0xA97F}, {0xAC00, 0xD7AF},   {0xD7B0, 0xD7FF},   {0xF900, 0xFAFF},
    {0xFE30, 0xFE4F}, {0xFF61, 0xFFDC}, {0x1B000, 0x1B16F}, {0x20000, 0x3FFFF},
};

bool isHighSurrogate(char16_t u) { return u >= 0xD800 && u <= 0xDBFF; }
bool isLowSurrogate(char16_t u) { return u >= 0xDC00 && u <= 0xDFFF; }

}  // namespace

bool isCJKCodePoint(char32_t c) {
  for (const CodeRange& range : kCJKRanges) {
    if (c < range.first) return false;
    if (c <= range.last) return true;
  }
  return false;
}

bool containsCJKCharacter(std::u16string_view text) {
  for (std::size_t i = 0; i < text.size(); ++i) {
    char32_t c = text[i];
    if (isHighSurrogate(text[i]) && i + 1 < text.size() && isLowSurrogate(text[i + 1])) {
      c = 0x10000 + ((static_cast<char32_t>(text[i]) - 0xD800) << 10) + (text[i + 1] - 0xDC00);
      ++i;
    } else if (isHighSurrogate(text[i]) || isLowSurrogate(text[i])) {
      continue;
    }
    if (isCJKCodePoint(c)) return true;
  }
  return false;
}

}  // namespace corvel
