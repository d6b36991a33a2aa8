// The layout analyser: driver, columns, paragraphs, and whole pages.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"

namespace corvel {
namespace {

using testing::line;
using testing::text;

std::shared_ptr<RVTextLayoutAnalyser> analysed(const RVBlockArray& lines) {
  auto analyser = RVTextLayoutAnalyser::init();
  analyser->addRecognitionBlocks(lines);
  analyser->analyse(Size{1000, 1000}, RVWritingDirectionHorizontal);
  return analyser;
}

// Columns as lists of paragraphs as lists of line texts.
using Tree = std::vector<std::vector<std::vector<std::string>>>;
Tree treeOf(const RVTextLayoutAnalyser& analyser) {
  Tree tree;
  for (const auto& column : *analyser.layoutBlocks()) {
    auto& paragraphs = tree.emplace_back();
    for (const auto& paragraph : *column->childBlocks()) {
      auto& lines = paragraphs.emplace_back();
      for (const auto& l : *paragraph->childBlocks()) lines.push_back(text(l));
    }
  }
  return tree;
}

// ---- Driver.

TEST(LayoutDriver, EmptyPage) {
  auto analyser = RVTextLayoutAnalyser::init();
  EXPECT_EQ(analyser->layoutBlocks(), nullptr);
  analyser->analyse(Size{0, 0}, 0);
  ASSERT_NE(analyser->layoutBlocks(), nullptr);
  EXPECT_TRUE(analyser->layoutBlocks()->empty());
  EXPECT_EQ(analyser->text(), u"");
}

TEST(LayoutDriver, TextIsFrozenAtTheFirstRead) {
  auto below = line("below", 0.1, 0.5, 0.3, 0.02), above = line("above", 0.1, 0.8, 0.3, 0.02);
  auto analyser = RVTextLayoutAnalyser::init();
  analyser->addRecognitionBlock(below);
  analyser->addRecognitionBlock(above);
  EXPECT_EQ(toUTF8(analyser->text()), "below\n\nabove");
  analyser->analyse(Size{1, 1}, 0);
  EXPECT_EQ(toUTF8(analyser->text()), "below\n\nabove");
  analyser->setOrderedText(std::nullopt);
  // One column now. "below" made it and kept matchType 0; "above" went in front with a
  // line feed before it.
  EXPECT_EQ(toUTF8(analyser->text()), "\nabovebelow");
  EXPECT_EQ(analyser->layoutBlocks(), analyser->columnBlocks());
  EXPECT_EQ(analyser->textBlocks()->size(), 2u);  // the input is left as it was
}

TEST(LayoutDriver, JoiningLooksAtTheTextSoFar) {
  auto analyser = RVTextLayoutAnalyser::init();
  struct Case {
    std::vector<const char*> texts;
    const char* want;
  } cases[] = {
      {{"X", "", "Y"}, "X\n\n\n\nY"},
      {{"", "X"}, "X"},
      {{"", "", ""}, ""},
      {{}, ""},
  };
  for (const Case& c : cases) {
    RVBlockArray blocks;
    for (const char* t : c.texts) blocks.push_back(line(t, 0, 0, 1, 1));
    EXPECT_EQ(toUTF8(analyser->textFromBlocks(blocks)), c.want);
  }
}

// ---- Columns.

TEST(LayoutColumns, NewColumnsGoBeforeTheFirstColumnWhollyToTheirRight) {
  auto analyser = RVTextLayoutAnalyser::init();
  analyser->addRecognitionBlocks({line("middle", 0.4, 0.5, 0.2, 0.02),
                                  line("left", 0.1, 0.5, 0.2, 0.02),
                                  line("right", 0.7, 0.5, 0.2, 0.02),
                                  // Only touches "middle" (right edge 0.4): goes after it.
                                  line("touch", 0.25, 0.5, 0.15, 0.02)});
  analyser->buildColumns();
  std::vector<std::string> order;
  for (const auto& c : *analyser->columnBlocks()) order.push_back(text(c));
  EXPECT_EQ(order, (std::vector<std::string>{"left", "middle", "touch", "right"}));
  EXPECT_EQ(analyser->blockMatches(line("x", 0.71, 0, 0.1, 0.1), *analyser->columnBlocks()), 3);
  EXPECT_EQ(analyser->blockMatches(line("x", 0.9, 0, 0.1, 0.1), *analyser->columnBlocks()),
            std::numeric_limits<std::int64_t>::max());
  EXPECT_EQ(analyser->blockMatches(line("x", 0.9, 0, 0.1, 0.1), {}),
            std::numeric_limits<std::int64_t>::max());
}

TEST(LayoutColumns, ALoneLineInsideAColumnJoinsIt) {
  auto caption = line("caption", 0.15, 0.65, 0.2, 0.02);
  auto analyser =
      analysed({line("top", 0.1, 0.8, 0.4, 0.02), caption, line("bottom", 0.1, 0.5, 0.4, 0.02)});
  ASSERT_EQ(analyser->layoutBlocks()->size(), 1u);
  // The caption came in with matchType 0, so it is glued to the line above it.
  EXPECT_EQ(toUTF8(analyser->text()), "topcaption\nbottom");
  EXPECT_EQ(treeOf(*analyser), (Tree{{{"top"}, {"caption"}, {"bottom"}}}));
  // Outside every other column it stays a column of its own.
  EXPECT_EQ(analysed({line("top", 0.1, 0.8, 0.4, 0.02), line("aside", 0.15, 0.9, 0.2, 0.02)})
                ->layoutBlocks()
                ->size(),
            2u);
}

TEST(LayoutColumns, ColumnOrder) {
  auto col = [](double x, double y, double h) { return line("c", x, y, 0.3, h); };
  struct Case {
    const char* name;
    std::shared_ptr<RVRecognitionBlock> a, b;
    std::int64_t want;
  } cases[] = {
      {"a wholly below b", col(0.1, 0.1, 0.2), col(0.1, 0.5, 0.2), 1},
      {"a wholly above b, far right", col(0.9, 0.5, 0.2), col(0.1, 0.1, 0.2), -1},
      {"overlapping", col(0.1, 0.1, 0.5), col(0.6, 0.3, 0.5), 0},
      {"a's bottom touches b's top", col(0.1, 0.5, 0.2), col(0.1, 0.25, 0.25), 0},
      {"a's top touches b's bottom", col(0.1, 0.25, 0.25), col(0.1, 0.5, 0.2), 0},
      {"null", nullptr, col(0.1, 0.1, 0.1), 0},
  };
  for (const Case& c : cases) EXPECT_EQ(compareColumns(c.a, c.b, nullptr), c.want) << c.name;
}

TEST(LayoutColumns, SideBySideColumnsKeepTheirOrderAndHigherColumnsComeFirst) {
  // A footer column lower on the page, found first; two side-by-side columns above it.
  auto analyser = analysed({line("footer", 0.05, 0.05, 0.9, 0.02), line("L1", 0.1, 0.8, 0.35, 0.02),
                            line("R1", 0.55, 0.8, 0.35, 0.02), line("L2", 0.1, 0.777, 0.35, 0.02),
                            line("R2", 0.55, 0.777, 0.35, 0.02)});
  EXPECT_EQ(treeOf(*analyser), (Tree{{{"L1", "L2"}}, {{"R1", "R2"}}, {{"footer"}}}));
}

TEST(LayoutColumns, TouchingColumnsReadInTheOrderTheyWereFound) {
  // The right column's left edge is the left column's right edge.
  auto l1 = [] { return line("L1", 0.1, 0.8, 0.4, 0.02); };
  auto r1 = [] { return line("R1", 0.5, 0.8, 0.4, 0.02); };
  auto l2 = [] { return line("L2", 0.1, 0.777, 0.4, 0.02); };
  auto r2 = [] { return line("R2", 0.5, 0.777, 0.4, 0.02); };
  EXPECT_EQ(treeOf(*analysed({l1(), r1(), l2(), r2()})), (Tree{{{"L1", "L2"}}, {{"R1", "R2"}}}));
  // Found right first: the left column only touches it, so it goes after it.
  EXPECT_EQ(treeOf(*analysed({r1(), l1(), r2(), l2()})), (Tree{{{"R1", "R2"}}, {{"L1", "L2"}}}));
}

// ---- Paragraphs.

TEST(LayoutParagraphs, LinesContinueTheEarliestParagraphThatTakesThem) {
  auto analyser = RVTextLayoutAnalyser::init();
  auto only = line("only", 0.1, 0.5, 0.3, 0.02, 42);
  auto column = RVRecognitionBlock::initColumnWithBlock(only);
  analyser->buildParagraphBlocks(column);
  ASSERT_EQ(column->childBlocks()->size(), 1u);
  auto paragraph = column->childBlocks()->front();
  EXPECT_EQ(paragraph->level(), RVRecognitionBlockLevelParagraph);
  EXPECT_EQ(paragraph->boundingBox(), only->boundingBox());
  EXPECT_EQ(paragraph->confidence(), 42);
  EXPECT_EQ(text(paragraph), "only");

  // Two paragraphs both accept `shared`: the earlier-opened one takes it.
  auto p1 = RVRecognitionBlock::initWithText(u"", Rect{0.1, 0.5, 0.3, 0.02}, 0,
                                             RVRecognitionBlockLevelParagraph);
  auto p2 = RVRecognitionBlock::initWithText(u"", Rect{0.105, 0.5, 0.3, 0.02}, 0,
                                             RVRecognitionBlockLevelParagraph);
  RVBlockMatchType type = RVBlockMatchSameLine;
  EXPECT_EQ(analyser->isContinuous(line("shared", 0.1, 0.479, 0.3, 0.02), {p1, p2}, &type), p1);
  EXPECT_EQ(type, RVBlockMatchSameColumn);
  type = RVBlockMatchSameLine;
  EXPECT_EQ(analyser->isContinuous(line("far", 0.1, 0.1, 0.3, 0.02), {p1, p2}, &type), nullptr);
  EXPECT_EQ(type, RVBlockMatchSameLine);  // untouched on a miss

  auto empty = RVRecognitionBlock::initColumnWithBlock(only);
  empty->childBlocks()->clear();
  analyser->buildParagraphBlocks(empty);
  EXPECT_TRUE(empty->childBlocks()->empty());
}

TEST(LayoutParagraphs, LineGapsDecideParagraphs) {
  auto analyser = analysed({line("a1", 0.1, 0.80, 0.4, 0.02), line("a2", 0.1, 0.776, 0.4, 0.02),
                            // gap 0.006: too far for the paragraph above
                            line("b1", 0.1, 0.750, 0.4, 0.02), line("b2", 0.1, 0.725, 0.4, 0.02),
                            // aligned but indented by more than the allowance
                            line("c1", 0.13, 0.70, 0.4, 0.02)});
  EXPECT_EQ(treeOf(*analyser), (Tree{{{"a1", "a2"}, {"b1", "b2"}}, {{"c1"}}}));
}

// ---- Bad geometry gets grouped without complaint.

TEST(LayoutRobustness, NonFiniteAndNegativeGeometry) {
  double nan = std::numeric_limits<double>::quiet_NaN();
  double inf = std::numeric_limits<double>::infinity();
  RVBlockArray page = {line("nan", nan, nan, 0.3, 0.02),  line("ok", 0.1, 0.8, 0.3, 0.02),
                       line("inf", inf, 0.5, inf, 0.02),  line("neg", 0.4, 0.8, -0.3, -0.02),
                       line("zero", 0.1, 0.77, 0, 0),     line("nanSize", 0.1, 0.7, nan, nan),
                       line("ok2", 0.1, 0.777, 0.3, 0.02)};
  auto analyser = analysed(page);
  std::string all = toUTF8(analyser->text());
  for (const char* t : {"nan", "ok", "inf", "neg", "zero", "nanSize", "ok2"})
    EXPECT_NE(all.find(t), std::string::npos) << t;
  std::size_t lines = 0;
  for (const auto& column : treeOf(*analyser))
    for (const auto& paragraph : column) lines += paragraph.size();
  // Every line lands once, except one swallowed by a line it shares a row with.
  EXPECT_GE(lines, page.size() - 1);
  EXPECT_LE(lines, page.size());
}

}  // namespace
}  // namespace corvel
