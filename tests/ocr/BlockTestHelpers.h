// Small builders shared by the block and layout suites.
#pragma once

#include <memory>
#include <nlohmann/json.hpp>
#include <string>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "support/TestSupport.h"

namespace corvel::testing {

inline std::shared_ptr<RVRecognitionBlock> line(const std::string& text, double x, double y,
                                                double w, double h, double confidence = 100) {
  return RVRecognitionBlock::initWithText(fromUTF8(text), Rect{x, y, w, h}, confidence,
                                          RVRecognitionBlockLevelLine);
}

inline std::string text(const std::shared_ptr<RVRecognitionBlock>& block) {
  return block && block->text() ? toUTF8(*block->text()) : "(nil)";
}

// The line blocks of the committed article page (tests/fixtures/layout/article.json).
inline RVBlockArray articleLines() {
  RVBlockArray lines;
  for (const auto& entry : nlohmann::json::parse(fixtureText("layout/article.json"))) {
    lines.push_back(RVRecognitionBlock::initWithText(
        fromUTF8(entry["text"].get<std::string>()),
        rectFromString(entry["boundingBox"].get<std::string>()), entry["confidence"].get<double>(),
        static_cast<RVRecognitionBlockLevel>(entry["level"].get<int>())));
  }
  return lines;
}

// Restores a tunable global when the test ends, whatever it did to it.
struct TunableGuard {
  double& value;
  const double saved = value;
  ~TunableGuard() { value = saved; }
};

}  // namespace corvel::testing
