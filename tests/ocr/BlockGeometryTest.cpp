// Geometry predicates at the exact boundaries of their tolerances.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVRecognitionBlock.h"

namespace corvel {
namespace {

using testing::line;
using testing::TunableGuard;

std::shared_ptr<RVRecognitionBlock> paragraph(Rect box) {
  return RVRecognitionBlock::initWithText(u"", box, 0, RVRecognitionBlockLevelParagraph);
}

// A paragraph whose last child is L = (0.25, 0.50, 0.25, 0.02): L.maxX = 0.5, L.minY = 0.5.
std::shared_ptr<RVRecognitionBlock> afterL() {
  auto p = paragraph(Rect{0, 0, 0.1, 0.1});
  p->childBlocks()->push_back(line("x", 0.25, 0.50, 0.25, 0.02));
  return p;
}

TEST(BlockGeometry, SameLineBoundaries) {
  auto p = afterL();
  struct Case {
    const char* name;
    double minX, minY;
    bool sameLine;
  } cases[] = {
      // The bottom must sit at least `allowance` above the last child's.
      {"bottom exactly allowance above", 0.503, 0.5 + allowance, true},
      {"bottom a hair below the allowance", 0.503, std::nextafter(0.5 + allowance, 0.0), false},
      // The gap to the last child: strictly positive, strictly under maxWordSeperation.
      {"touching the last child", 0.5, 0.5007, false},
      {"gap equal to maxWordSeperation", 0.5 + maxWordSeperation, 0.5007, false},
      {"gap a hair under", std::nextafter(0.5 + maxWordSeperation, 0.0), 0.5007, true},
      {"NaN", std::numeric_limits<double>::quiet_NaN(), 0.5007, false},
  };
  for (const Case& c : cases)
    EXPECT_EQ(p->isSameLine(Rect{c.minX, c.minY, 0.1, 0.02}), c.sameLine) << c.name;
  EXPECT_FALSE(paragraph(Rect{0, 0, 1, 1})->isSameLine(Rect{0.503, 0.5007, 0.1, 0.02}));
}

TEST(BlockGeometry, SameColumnBoundaries) {
  auto s = line("s", 0.10, 0.50, 0.40, 0.02);
  struct Case {
    const char* name;
    Rect r;
    bool sameColumn;
  } cases[] = {
      {"top equal to S's bottom", {0.11, 0.4375, 0.3, 0.0625}, true},
      {"top maxLineSeperation below", {0.11, 0.5 - maxLineSeperation - 0.01, 0.3, 0.01}, true},
      {"top more than maxLineSeperation below", {0.11, 0.4849, 0.3, 0.01}, false},
      {"top above S's bottom", {0.11, 0.45, 0.3, 0.0501}, false},
      {"left edge an allowance right", {0.10 + columnMatchAllowance, 0.4375, 0.3, 0.0625}, false},
      {"left edge an allowance left", {0.10 - columnMatchAllowance, 0.4375, 0.3, 0.0625}, false},
      {"left edge just inside the allowance",
       {std::nextafter(0.10 + columnMatchAllowance, 0.0), 0.4375, 0.3, 0.0625},
       true},
  };
  for (const Case& c : cases) EXPECT_EQ(s->isSameColumn(c.r), c.sameColumn) << c.name;
}

TEST(BlockGeometry, ContinuityPrefersSameLine) {
  // The last child ends where the paragraph's box ends, so one box can pass both tests.
  auto p = paragraph(Rect{0.5, 0.5, 0.1, 0.02});
  p->childBlocks()->push_back(line("a", 0.49, 0.47, 0.011, 0.02));  // L.maxX = 0.501
  Rect both{0.502, 0.4707, 0.1, 0.0293};  // right of L, raised; top at S's bottom, aligned
  ASSERT_TRUE(p->isSameLine(both));
  ASSERT_TRUE(p->isSameColumn(both));
  EXPECT_EQ(p->isContinuous(both), RVBlockMatchSameLine);
  EXPECT_EQ(p->isContinuous(Rect{0.5, 0.48, 0.1, 0.02}), RVBlockMatchSameColumn);
  EXPECT_EQ(p->isContinuous(Rect{0.9, 0.1, 0.1, 0.02}), RVBlockMatchNone);
}

TEST(BlockGeometry, TwoBlockPredicates) {
  auto any = line("r", 0, 0, 1, 1);
  auto a = line("a", 0, 0.5, 0.25, 0.0625);
  // Overlap of exactly half of B's height counts; a little less does not.
  EXPECT_TRUE(any->isBlockOnSameLine(a, line("b", 0.5, 0.53125, 0.25, 0.0625)));
  EXPECT_FALSE(any->isBlockOnSameLine(a, line("b", 0.5, 0.5390625, 0.25, 0.0625)));
  // No overlap at all: only a zero-height B is "on the same line".
  EXPECT_FALSE(any->isBlockOnSameLine(a, line("b", 0.5, 0.9, 0.25, 0.0625)));
  EXPECT_TRUE(any->isBlockOnSameLine(a, line("b", 0.5, 0.9, 0.25, 0)));
  // Touching edges count as after and above.
  EXPECT_TRUE(any->isBlockOnAfterBlock(line("a", 0.5, 0, 0.1, 0.1), line("b", 0.25, 0, 0.25, 1)));
  EXPECT_FALSE(any->isBlockOnAfterBlock(line("a", 0.49, 0, 0.1, 0.1), line("b", 0.25, 0, 0.25, 1)));
  EXPECT_TRUE(any->isBlockAboveBlock(line("a", 0, 0.5, 1, 0.1), line("b", 0, 0.25, 1, 0.25)));
  EXPECT_FALSE(any->isBlockAboveBlock(line("a", 0, 0.49, 1, 0.1), line("b", 0, 0.25, 1, 0.25)));
  EXPECT_FALSE(any->isBlockAboveBlock(nullptr, a));
  // Column membership: strict within columnMatchAllowance of the left edge.
  auto column = line("c", 0.2, 0, 0.3, 1);
  EXPECT_FALSE(any->isBlockInColumn(nullptr));
  EXPECT_TRUE(column->isBlockInColumn(line("x", 0.21, 0.5, 0.1, 0.1)));
  EXPECT_FALSE(column->isBlockInColumn(line("x", 0.2 + columnMatchAllowance, 0.5, 0.1, 0.1)));
}

TEST(BlockGeometry, TunablesAreReadAtEveryCall) {
  auto p = afterL();
  TunableGuard word{maxWordSeperation}, raise{allowance}, column{columnMatchAllowance};
  Rect wideGap{0.51, 0.5007, 0.1, 0.02};
  EXPECT_FALSE(p->isSameLine(wideGap));
  maxWordSeperation = 0.02;
  EXPECT_TRUE(p->isSameLine(wideGap));
  allowance = 0;
  EXPECT_TRUE(p->isSameLine(Rect{0.503, 0.5, 0.1, 0.02}));  // level bottoms now match
  columnMatchAllowance = 0.05;
  EXPECT_TRUE(line("c", 0.2, 0, 0.3, 1)->isBlockInColumn(line("x", 0.24, 0.5, 0.1, 0.1)));
}

}  // namespace
}  // namespace corvel
