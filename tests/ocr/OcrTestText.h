// Text comparison for recognition tests: expected texts come from the fixture's source,
// compared by character error rate after normalising white space.
#pragma once

#include <algorithm>
#include <string>
#include <vector>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/String.h"
#include "support/TestSupport.h"
#include "support/TextDistance.h"

namespace corvel::testing {

// The source text of a fixture page (tests/fixtures/ocr/NAME.txt).
inline std::string fixtureText(const std::string& name) {
  auto bytes = readFile(fixturePath("ocr/" + name + ".txt"));
  return bytes ? std::string(bytes->begin(), bytes->end()) : std::string();
}

// Edit distance between the two texts divided by the expected text's length.
inline double characterErrorRate(const std::string& expected, const std::string& actual,
                                 bool keepSpaces = true) {
  std::u32string a = normalised(expected, keepSpaces), b = normalised(actual, keepSpaces);
  if (a.empty()) return b.empty() ? 0.0 : 1.0;
  return static_cast<double>(editDistance(a, b)) / static_cast<double>(a.size());
}

}  // namespace corvel::testing
