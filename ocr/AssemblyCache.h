// Internal: what a container remembers about its children between additions.
#pragma once

#include <cstdint>
#include <limits>
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

}  // namespace corvel
