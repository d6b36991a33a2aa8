// The layout analyser: driver, columns, paragraphs, bad geometry, and whole pages (the
// bundled article, read in recogniser order and shuffled).
#include <gtest/gtest.h>

#include <algorithm>
#include <limits>
#include <random>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/platform/Files.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using testing::articleLines;
using testing::line;
using testing::text;

std::shared_ptr<RVTextLayoutAnalyser> analysed(const RVBlockArray& lines) {
  auto analyser = RVTextLayoutAnalyser::init();
  analyser->addRecognitionBlocks(lines);
  analyser->analyse(Size{2480, 3508}, RVWritingDirectionHorizontal);  // the size is not used
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
  auto column = RVRecognitionBlock::initWithText(u"", Rect{}, 0, RVRecognitionBlockLevelColumn);
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

// ---- Whole pages.

// The reading order a person gives the page, as the fixture's line numbers: columns of
// paragraphs of lines. The heading; the left column, with the caption (17) that sits
// inside it; the right column. The fixture's texts are all different.
const std::vector<std::vector<std::vector<std::size_t>>> kReading = {
    {{0}}, {{1, 3, 5}, {7, 9, 11, 13}, {17}, {18, 19, 20}}, {{2, 4, 6}, {8, 10, 12}, {14, 15, 16}}};

// That order as texts, and the page's text: columns a blank line apart, lines a line feed
// apart, except the caption: it is folded in unmatched, so it is glued to the line above.
std::pair<Tree, std::string> articleReading() {
  RVBlockArray lines = articleLines();
  std::pair<Tree, std::string> out;
  for (const auto& column : kReading) {
    auto& paragraphs = out.first.emplace_back();
    std::string joined;
    for (const auto& paragraph : column) {
      auto& texts = paragraphs.emplace_back();
      for (std::size_t i : paragraph) {
        texts.push_back(text(lines.at(i)));
        joined += (joined.empty() || i == 17 ? "" : "\n") + texts.back();
      }
    }
    out.second += (out.second.empty() ? "" : "\n\n") + joined;
  }
  return out;
}

TEST(LayoutPage, ArticleInAnyLineOrderGivesTheReadingOrderColumnsAndParagraphs) {
  std::mt19937 random(20240611);
  const auto [tree, pageText] = articleReading();
  // Recogniser order (which also gives the text), bottom to top, shuffled.
  for (int round = 0; round < 6; ++round) {
    RVBlockArray lines = articleLines();
    if (round == 1) std::reverse(lines.begin(), lines.end());
    if (round > 1) std::shuffle(lines.begin(), lines.end(), random);
    EXPECT_EQ(treeOf(*analysed(lines)), tree) << "round " << round;
  }
  EXPECT_EQ(toUTF8(analysed(articleLines())->text()), pageText);
}

}  // namespace
}  // namespace corvel
