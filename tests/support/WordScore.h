// Word scores of a recognised text against its truth, as the OCR corpus's scorer counts
// them: words are split on white space, punctuation and symbols (Unicode P* and S*,
// except $ % & @ # and the euro, pound and section signs) are stripped from both ends,
// words left empty are dropped, and case counts. Used by the recognition tests and by
// bench_ocr_quality.
#pragma once

#include <unicode/uchar.h>

#include <algorithm>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "support/TextDistance.h"

namespace corvel::testing {

inline bool strippable(char32_t c) {
  if (std::u32string_view(U"$%&@#\u20AC\u00A3\u00A7").find(c) != std::u32string_view::npos)
    return false;
  return (U_GET_GC_MASK(static_cast<UChar32>(c)) & (U_GC_P_MASK | U_GC_S_MASK)) != 0;
}

inline std::vector<std::u32string> words(const std::string& utf8) {
  std::vector<std::u32string> out;
  std::u32string text = normalised(utf8);
  std::size_t start = 0;
  while (start <= text.size()) {
    std::size_t end = text.find(U' ', start);
    if (end == std::u32string::npos) end = text.size();
    std::size_t a = start, b = end;
    while (a < b && strippable(text[a])) ++a;
    while (b > a && strippable(text[b - 1])) --b;
    if (a < b) out.push_back(text.substr(a, b - a));
    start = end + 1;
  }
  return out;
}

struct WordScore {
  double recall = 0;     // matched truth words / truth words
  double precision = 0;  // matched words / output words
  double wer = 0;        // word edit distance / truth words
};

inline WordScore scoreWords(const std::string& truth, const std::string& output) {
  auto expected = words(truth), got = words(output);
  std::map<std::u32string, long> counts;
  for (const auto& w : expected) ++counts[w];
  std::size_t matched = 0;
  for (const auto& w : got) {
    if (auto it = counts.find(w); it != counts.end() && it->second > 0) {
      --it->second;
      ++matched;
    }
  }
  // Words as numbers, so the edit distance runs over code points of a u32string.
  std::map<std::u32string, char32_t> ids;
  auto encode = [&](const std::vector<std::u32string>& list) {
    std::u32string out;
    for (const auto& w : list)
      out += ids.emplace(w, static_cast<char32_t>(ids.size() + 1)).first->second;
    return out;
  };
  std::u32string a = encode(expected), b = encode(got);
  WordScore score;
  double truthWords = static_cast<double>(expected.size());
  score.recall = expected.empty() ? 1 : static_cast<double>(matched) / truthWords;
  score.precision =
      got.empty() ? (expected.empty() ? 1 : 0) : static_cast<double>(matched) / got.size();
  score.wer = expected.empty() ? static_cast<double>(got.size())
                               : static_cast<double>(editDistance(a, b)) / truthWords;
  return score;
}

}  // namespace corvel::testing
