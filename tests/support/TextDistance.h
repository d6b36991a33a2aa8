// Text distance for recognition results: white space normalised, then the edit distance
// over code points. Used by the recognition tests and by bench_ocr, so both score alike.
#pragma once

#include <algorithm>
#include <string>
#include <vector>

#include "Corvelbase/platform/String.h"

namespace corvel::testing {

// Runs of white space become one blank (or nothing, for scripts written without
// spaces), so line breaks and paragraph breaks do not count as errors.
inline std::u32string normalised(const std::string& utf8, bool keepSpaces = true) {
  String utf16 = fromUTF8(utf8);
  std::u32string out;
  bool space = false;
  for (std::size_t i = 0; i < utf16.size(); ++i) {
    char32_t c = utf16[i];
    if (c >= 0xD800 && c < 0xDC00 && i + 1 < utf16.size()) {
      c = 0x10000 + ((c - 0xD800) << 10) + (utf16[++i] - 0xDC00);
    }
    if (c == ' ' || c == '\n' || c == '\t' || c == '\r') {
      space = true;
      continue;
    }
    if (space && keepSpaces && !out.empty()) out += U' ';
    space = false;
    out += c;
  }
  return out;
}

// Levenshtein distance between two code-point strings.
inline std::size_t editDistance(const std::u32string& a, const std::u32string& b) {
  std::vector<std::size_t> row(b.size() + 1);
  for (std::size_t j = 0; j <= b.size(); ++j) row[j] = j;
  for (std::size_t i = 1; i <= a.size(); ++i) {
    std::size_t diagonal = row[0];
    row[0] = i;
    for (std::size_t j = 1; j <= b.size(); ++j) {
      std::size_t up = row[j];
      row[j] = std::min({row[j] + 1, row[j - 1] + 1, diagonal + (a[i - 1] == b[j - 1] ? 0 : 1)});
      diagonal = up;
    }
  }
  return row[b.size()];
}

// The edit distance between the two texts over the expected text's length.
inline double characterErrorRate(const std::string& expected, const std::string& actual,
                                 bool keepSpaces = true) {
  std::u32string a = normalised(expected, keepSpaces), b = normalised(actual, keepSpaces);
  if (a.empty()) return b.empty() ? 0.0 : 1.0;
  return static_cast<double>(editDistance(a, b)) / static_cast<double>(a.size());
}

}  // namespace corvel::testing
