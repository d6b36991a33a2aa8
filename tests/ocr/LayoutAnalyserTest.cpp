// The layout analyser: driver, columns, paragraphs, and whole pages.
#include <gtest/gtest.h>

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
    for (const auto& paragraph : column->children()) {
      auto& lines = paragraphs.emplace_back();
      for (const auto& l : paragraph->children()) lines.push_back(text(l));
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
  auto analyser = RVTextLayoutAnalyser::init();
  analyser->addRecognitionBlocks(
      {line("below", 0.1, 0.5, 0.3, 0.02), line("above", 0.1, 0.8, 0.3, 0.02)});
  EXPECT_EQ(toUTF8(analyser->text()), "below\n\nabove");
  analyser->analyse(Size{1, 1}, 0);
  EXPECT_EQ(toUTF8(analyser->text()), "below\n\nabove");
  analyser->setOrderedText(std::nullopt);
  // One column now. "below" made it and kept matchType 0; "above" went in front with a
  // line feed before it.
  EXPECT_EQ(toUTF8(analyser->text()), "\nabovebelow");
  EXPECT_EQ(analyser->textBlocks()->size(), 2u);  // the input is left as it was
}

TEST(LayoutDriver, JoiningLooksAtTheTextSoFar) {
  auto join = [](std::vector<const char*> texts) {
    RVBlockArray blocks;
    for (const char* t : texts) blocks.push_back(line(t, 0, 0, 1, 1));
    return toUTF8(RVTextLayoutAnalyser::init()->textFromBlocks(blocks));
  };
  EXPECT_EQ(join({"X", "", "Y"}), "X\n\n\n\nY");  // a later empty text doubles the separator
  EXPECT_EQ(join({"", "X"}), "X");                // a leading one adds nothing
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

TEST(LayoutColumns, ATouchingColumnFoundFirstReadsFirst) {
  // Found right first, the left column only touches it, so it reads second. Side-by-side
  // columns found in any order are covered by the whole-page tests.
  auto touching = analysed({line("R1", 0.5, 0.8, 0.4, 0.02), line("L1", 0.1, 0.8, 0.4, 0.02),
                            line("R2", 0.5, 0.777, 0.4, 0.02), line("L2", 0.1, 0.777, 0.4, 0.02)});
  EXPECT_EQ(treeOf(*touching), (Tree{{{"R1", "R2"}}, {{"L1", "L2"}}}));
}

// ---- Paragraphs.

TEST(LayoutParagraphs, LinesContinueTheEarliestParagraphThatTakesThem) {
  auto analyser = RVTextLayoutAnalyser::init();
  auto only = line("only", 0.1, 0.5, 0.3, 0.02, 42);
  auto column = RVRecognitionBlock::initColumnWithBlock(only);
  analyser->buildParagraphBlocks(column);
  ASSERT_EQ(column->children().size(), 1u);
  // The paragraph takes the line's box and confidence, and its text.
  EXPECT_TRUE(column->children().front()->isEqual(RVRecognitionBlock::initWithText(
      u"only", only->boundingBox(), 42, RVRecognitionBlockLevelParagraph)));
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
  // A column without children ends without paragraphs.
  column->setChildBlocks(nullptr);
  analyser->buildParagraphBlocks(column);
  EXPECT_TRUE(column->children().empty());
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
