// Internal: what a container remembers about its children between additions.
#pragma once

#include <cstdint>
#include <limits>
#include <optional>
#include <string_view>
#include <unordered_set>

#include "Corvelbase/RVRecognitionBlock.h"

namespace corvel {

// Valid only while (1) the text equals buildTextString() of the children, (2) no child's
// text, box or match type has changed (each child tells its watchers) and (3) the child
// array has not been handed out. Then a block whose hash no child has cannot be a child
// already, and one whose bottom is not above `minBottom` goes at the end.
struct RVRecognitionBlock::AssemblyCache {
  bool valid = false;
  // Lowest bottom edge among the children (NaN edges left out: they never compare below).
  double minBottom = std::numeric_limits<double>::infinity();
  std::unordered_set<std::uint64_t> hashes;
};

// FNV-1a over UTF-16 units. Its state is its value, so the hash of a text that grows at
// its end is carried on from the hash of what it was.
inline constexpr std::uint64_t kTextHashSeed = 14695981039346656037ull;
inline std::uint64_t continueTextHash(std::uint64_t hash, std::u16string_view units) {
  for (char16_t unit : units) {
    hash ^= static_cast<std::uint64_t>(unit);
    hash *= 1099511628211ull;
  }
  return hash;
}
// 0 for a nil text.
inline std::uint64_t textHash(const std::optional<String>& text) {
  return text ? continueTextHash(kTextHashSeed, *text) : 0;
}

}  // namespace corvel
