// The geometry predicates at the exact boundaries of their tolerances, then assembling
// containers and producing their texts, words and writing direction.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVRecognitionBlock.h"

namespace corvel {
namespace {

using testing::line;
using testing::text;
using testing::TunableGuard;
using Texts = std::vector<std::string>;

// ---- Geometry predicates.

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

// ---- Assembly.

Texts texts(const RVBlockArray& blocks) {
  Texts out;
  for (const auto& b : blocks) out.push_back(text(b));
  return out;
}

// Order, box and re-adding are checked against a plain model on random sequences elsewhere;
// here the separators each match type puts in the text.
TEST(BlockAssembly, AddChildKeepsTopToBottomOrderAndSeparatesByMatchType) {
  auto column = RVRecognitionBlock::initColumnWithBlock(line("bottom", 0.1, 0.2, 0.3, 0.02));
  column->addChildBlock(line("top", 0.1, 0.8, 0.3, 0.02), RVBlockMatchSameColumn);
  column->addChildBlock(line("middle", 0.1, 0.5, 0.3, 0.02), RVBlockMatchSameColumn);
  // A level bottom goes after the existing child; same-line children get no blank.
  column->addChildBlock(line("level", 0.5, 0.2, 0.3, 0.02), RVBlockMatchSameLine);
  EXPECT_EQ(texts(column->children()), (Texts{"top", "middle", "bottom", "level"}));
  // "bottom" came in through the initialiser with matchType 0: nothing before it.
  EXPECT_EQ(text(column), "\ntop\nmiddlebottomlevel");
  column->setChildBlocks(nullptr);
  EXPECT_EQ(column->buildTextString(), u"");
}

TEST(BlockAssembly, InsertBlockMergesIntoALineOrPlacesAboveOrAppends) {
  auto foo = line("foo", 0.1, 0.8, 0.2, 0.02), low = line("low", 0.1, 0.5, 0.3, 0.02);
  auto column = RVRecognitionBlock::initColumnWithBlock(foo);
  column->addChildBlock(low, RVBlockMatchSameColumn);
  const Rect box = column->boundingBox();
  // Same line, to the right: appended to that child, which grows; the column does not.
  auto bar = line("bar", 0.35, 0.8, 0.2, 0.02);
  column->insertBlock(bar);
  EXPECT_EQ(text(foo), "foo bar");
  EXPECT_EQ(foo->boundingBox(), rectUnion(Rect{0.1, 0.8, 0.2, 0.02}, bar->boundingBox()));
  EXPECT_EQ(column->boundingBox(), box);
  EXPECT_EQ(column->children().size(), 2u);
  // Same line, to the left: prepended.
  column->insertBlock(line("pre", 0.0, 0.5, 0.05, 0.02));
  EXPECT_EQ(text(low), "pre low");
  // Between the lines: inserted before the first child it stands above, matchType 0 so glued.
  auto mid = line("mid", 0.1, 0.65, 0.3, 0.02);
  column->insertBlock(mid);
  EXPECT_EQ(texts(column->children()), (Texts{"foo bar", "mid", "pre low"}));
  EXPECT_EQ(column->boundingBox(), box);
  EXPECT_EQ(text(column), "foo barmid\npre low");
  // Below everything: appended, and only now the box grows.
  column->insertBlock(line("end", 0.1, 0.1, 0.3, 0.02));
  EXPECT_EQ(rectGetMinY(column->boundingBox()), 0.1);
  // A block already there changes nothing.
  column->insertBlock(mid);
  EXPECT_EQ(column->children().size(), 4u);
}

TEST(BlockAssembly, BuildParagraphsCutsAtLargeGapsWithTheRunningSpacing) {
  auto column = RVRecognitionBlock::initColumnWithBlock(line("one", 0.1, 0.88, 0.3, 0.02));
  column->addChildBlock(line("two", 0.1, 0.857, 0.3, 0.02), RVBlockMatchSameColumn);
  column->addChildBlock(line("three", 0.1, 0.78, 0.3, 0.02), RVBlockMatchSameColumn);
  const String columnText = *column->text();
  column->buildParagraphs();
  const RVBlockArray& paragraphs = column->children();
  ASSERT_EQ(paragraphs.size(), 2u);
  EXPECT_EQ(text(paragraphs[0]), "one\ntwo");
  EXPECT_EQ(paragraphs[0]->level(), RVRecognitionBlockLevelParagraph);
  EXPECT_NEAR(paragraphs[0]->lineSpacing(), 0.003, 1e-12);
  EXPECT_EQ(paragraphs[1]->lineSpacing(), -1000.0);
  EXPECT_EQ(*column->text(), columnText);  // the column's text is not rebuilt

  // The spacing is (s + gap) / n at each step: gaps 0.002, 0.004, 0.003 give 0.002.
  auto run = RVRecognitionBlock::initColumnWithBlock(line("a", 0, 0.9, 1, 0.01));
  double bottom = 0.9;
  for (double gap : {0.002, 0.004, 0.003})
    run->addChildBlock(line("b", 0, bottom -= gap + 0.01, 1, 0.01), RVBlockMatchSameColumn);
  run->addChildBlock(line("far", 0, 0.1, 1, 0.01), RVBlockMatchSameColumn);
  run->buildParagraphs();
  ASSERT_EQ(run->children().size(), 2u);
  EXPECT_NEAR(run->children().front()->lineSpacing(), 0.002, 1e-9);
}

TEST(BlockAssembly, WordsSplitAtWhitespaceAndPerCJKCharacter) {
  struct Case {
    const char* text;
    Texts words;
  } cases[] = {
      {"a  b", {"a", "", "b"}},  // empty pieces between separators are kept
      {"", {""}},
      {"漢字", {"漢", "字"}},
      {"漢ab", {"漢"}},                         // the trailing Latin run is dropped
      {"ab漢cd 字", {"ab", "漢", "字"}},        // runs before a CJK unit are kept
      {"かな 한국", {"か", "な", "한", "국"}},  // kana and hangul count as CJK too
  };
  for (const Case& c : cases) {
    Texts words;
    for (const String& w : line(c.text, 0, 0, 1, 1)->wordsInBlock()) words.push_back(toUTF8(w));
    EXPECT_EQ(words, c.words) << c.text;
  }
  auto nil = RVRecognitionBlock::initWithText(std::nullopt, Rect{}, 0, RVRecognitionBlockLevelLine);
  EXPECT_TRUE(nil->wordsInBlock().empty());
}

TEST(BlockAssembly, VerticalTextGoesOneUnitPerLine) {
  auto tall = line("漢字文", 0, 0, 0.02, 0.2), wide = line("漢字文", 0, 0, 0.2, 0.02);
  EXPECT_EQ(toUTF8(*tall->textUsingWritingDirection()), "漢\n字\n文");
  EXPECT_EQ(wide->writingDirection(), RVWritingDirectionHorizontal);
  EXPECT_EQ(line("ab", 0, 0, 0.02, 0.2)->writingDirection(), RVWritingDirectionHorizontal);
  EXPECT_EQ(line("漢", 0, 0, 0.02, 0.2)->writingDirection(), RVWritingDirectionHorizontal);
  // A supplementary ideograph is split into its two surrogates, one per line.
  auto pair = RVRecognitionBlock::initWithText(String(u"\U00020000x"), Rect{0, 0, 0.02, 0.2}, 0,
                                               RVRecognitionBlockLevelLine);
  EXPECT_EQ(*pair->textUsingWritingDirection(), String(u"\xD840\n\xDC00\nx"));
}

TEST(BlockAssembly, ChildLookupAndRemovalByValue) {
  auto a = line("a", 0, 0.5, 1, 0.1), b = line("b", 0, 0.3, 1, 0.1);
  auto p = RVRecognitionBlock::initWithText(u"", Rect{}, 0, RVRecognitionBlockLevelParagraph);
  p->childBlocks()->assign({a, b, line("a", 0, 0.5, 1, 0.1)});  // the last one a's twin by value
  EXPECT_EQ(p->childBlockForString(u"zzz", true), nullptr);
  EXPECT_EQ(p->childBlockForString(u"b", false), b);
  EXPECT_EQ(p->children().size(), 3u);
  EXPECT_EQ(p->childBlockForString(u"a", true), a);
  EXPECT_EQ(texts(p->children()), (Texts{"b"}));
}

}  // namespace
}  // namespace corvel
