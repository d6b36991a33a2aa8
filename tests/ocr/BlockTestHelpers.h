// Small builders shared by the block and layout suites.
#pragma once

#include <memory>
#include <string>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"

namespace corvel::testing {

inline std::shared_ptr<RVRecognitionBlock> line(const std::string& text, double x, double y,
                                                double w, double h, double confidence = 100) {
  return RVRecognitionBlock::initWithText(fromUTF8(text), Rect{x, y, w, h}, confidence,
                                          RVRecognitionBlockLevelLine);
}

inline std::string text(const std::shared_ptr<RVRecognitionBlock>& block) {
  return block && block->text() ? toUTF8(*block->text()) : "(nil)";
}

// Restores a tunable global when the test ends, whatever it did to it.
struct TunableGuard {
  double& value;
  const double saved = value;
  ~TunableGuard() { value = saved; }
};

}  // namespace corvel::testing
