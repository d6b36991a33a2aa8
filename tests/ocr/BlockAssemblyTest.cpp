// Assembling containers and producing their texts, words and writing direction.
#include <gtest/gtest.h>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/platform/CJK.h"

namespace corvel {
namespace {

using testing::line;
using testing::text;

std::vector<std::string> texts(const RVBlockArray& blocks) {
  std::vector<std::string> out;
  for (const auto& b : blocks) out.push_back(text(b));
  return out;
}

std::vector<std::string> utf8(const std::vector<String>& words) {
  std::vector<std::string> out;
  for (const auto& w : words) out.push_back(toUTF8(w));
  return out;
}

TEST(BlockAssembly, AddChildKeepsTopToBottomOrderAndGrowsTheBox) {
  auto top = line("top", 0.1, 0.8, 0.3, 0.02);
  auto middle = line("middle", 0.1, 0.5, 0.3, 0.02);
  auto bottom = line("bottom", 0.1, 0.2, 0.3, 0.02);
  auto column = RVRecognitionBlock::initColumnWithBlock(bottom);
  column->addChildBlock(top, RVBlockMatchSameColumn);
  column->addChildBlock(middle, RVBlockMatchSameColumn);
  EXPECT_EQ(texts(*column->childBlocks()), (std::vector<std::string>{"top", "middle", "bottom"}));
  EXPECT_EQ(column->boundingBox(), rectUnion(top->boundingBox(), bottom->boundingBox()));
  // The bottom line keeps matchType 0 (it came in through the initialiser), so no line feed.
  EXPECT_EQ(text(column), "\ntop\nmiddlebottom");

  // A level bottom goes after the existing child.
  auto level = line("level", 0.5, 0.2, 0.3, 0.02);
  column->addChildBlock(level, RVBlockMatchSameLine);
  EXPECT_EQ(texts(*column->childBlocks()).back(), "level");

  // Adding a child again only changes its match type.
  Rect box = column->boundingBox();
  column->addChildBlock(middle, RVBlockMatchNone);
  EXPECT_EQ(middle->matchType(), RVBlockMatchNone);
  EXPECT_EQ(column->childBlocks()->size(), 4u);
  EXPECT_EQ(column->boundingBox(), box);
  EXPECT_EQ(text(column), "\ntop\nmiddlebottomlevel");  // not rebuilt
}

TEST(BlockAssembly, SeparatorsFollowTheMatchTypes) {
  struct Case {
    RVBlockMatchType first, second;
    const char* want;
  } cases[] = {
      {RVBlockMatchNone, RVBlockMatchSameColumn, "A\nB"},
      {RVBlockMatchNone, RVBlockMatchSameLine, "AB"},
      {RVBlockMatchNone, RVBlockMatchNone, "AB"},
      {RVBlockMatchSameColumn, RVBlockMatchSameColumn, "\nA\nB"},
  };
  for (const Case& c : cases) {
    auto p = RVRecognitionBlock::initWithText(u"", Rect{}, 0, RVRecognitionBlockLevelParagraph);
    auto a = line("A", 0, 0.5, 1, 0.1), b = line("B", 0, 0.3, 1, 0.1);
    a->setMatchType(c.first);
    b->setMatchType(c.second);
    p->childBlocks()->assign({a, b});
    EXPECT_EQ(toUTF8(p->buildTextString()), c.want);
  }
  auto empty = RVRecognitionBlock::initWithText(u"x", Rect{}, 0, RVRecognitionBlockLevelColumn);
  EXPECT_EQ(empty->buildTextString(), u"");
}

TEST(BlockAssembly, InsertBlockMergesIntoALineOrPlacesAboveOrAppends) {
  auto foo = line("foo", 0.1, 0.8, 0.2, 0.02);
  auto low = line("low", 0.1, 0.5, 0.3, 0.02);
  auto column = RVRecognitionBlock::initColumnWithBlock(foo);
  column->addChildBlock(low, RVBlockMatchSameColumn);
  const Rect box = column->boundingBox();

  // Same line, to the right: appended to that child, which grows; the column does not.
  auto bar = line("bar", 0.35, 0.8, 0.2, 0.02);
  column->insertBlock(bar);
  EXPECT_EQ(text(foo), "foo bar");
  EXPECT_EQ(foo->boundingBox(), rectUnion(Rect{0.1, 0.8, 0.2, 0.02}, bar->boundingBox()));
  EXPECT_EQ(column->boundingBox(), box);
  EXPECT_EQ(column->childBlocks()->size(), 2u);
  // Same line, to the left: prepended.
  column->insertBlock(line("pre", 0.0, 0.5, 0.05, 0.02));
  EXPECT_EQ(text(low), "pre low");
  // Between the lines: inserted before the first child it stands above, matchType 0 so glued.
  auto mid = line("mid", 0.1, 0.65, 0.3, 0.02);
  column->insertBlock(mid);
  EXPECT_EQ(texts(*column->childBlocks()), (std::vector<std::string>{"foo bar", "mid", "pre low"}));
  EXPECT_EQ(column->boundingBox(), box);
  EXPECT_EQ(text(column), "foo barmid\npre low");
  // Below everything: appended, and only now the box grows.
  column->insertBlock(line("end", 0.1, 0.1, 0.3, 0.02));
  EXPECT_EQ(rectGetMinY(column->boundingBox()), 0.1);
  // A block already there changes nothing.
  column->insertBlock(mid);
  EXPECT_EQ(column->childBlocks()->size(), 4u);
}

TEST(BlockAssembly, BuildParagraphsCutsAtLargeGapsWithTheRunningSpacing) {
  auto column = RVRecognitionBlock::initColumnWithBlock(line("one", 0.1, 0.88, 0.3, 0.02));
  column->addChildBlock(line("two", 0.1, 0.857, 0.3, 0.02), RVBlockMatchSameColumn);
  column->addChildBlock(line("three", 0.1, 0.78, 0.3, 0.02), RVBlockMatchSameColumn);
  const String columnText = *column->text();
  column->buildParagraphs();
  const RVBlockArray& paragraphs = *column->childBlocks();
  ASSERT_EQ(paragraphs.size(), 2u);
  EXPECT_EQ(text(paragraphs[0]), "one\ntwo");
  EXPECT_NEAR(paragraphs[0]->lineSpacing(), 0.003, 1e-12);
  EXPECT_EQ(paragraphs[1]->lineSpacing(), -1000.0);
  EXPECT_EQ(paragraphs[0]->level(), RVRecognitionBlockLevelParagraph);
  EXPECT_EQ(*column->text(), columnText);  // the column's text is not rebuilt

  // The spacing is (s + gap) / n at each step: gaps 0.002, 0.004, 0.003 give 0.002.
  auto run = RVRecognitionBlock::initColumnWithBlock(line("a", 0, 0.9, 1, 0.01));
  double bottom = 0.9;
  for (double gap : {0.002, 0.004, 0.003}) {
    bottom -= gap + 0.01;
    run->addChildBlock(line("b", 0, bottom, 1, 0.01), RVBlockMatchSameColumn);
  }
  run->addChildBlock(line("far", 0, 0.1, 1, 0.01), RVBlockMatchSameColumn);
  run->buildParagraphs();
  ASSERT_EQ(run->childBlocks()->size(), 2u);
  EXPECT_NEAR(run->childBlocks()->front()->lineSpacing(), 0.002, 1e-9);
}

TEST(BlockAssembly, WordsSplitAtWhitespaceAndPerCJKCharacter) {
  struct Case {
    const char* text;
    std::vector<std::string> words;
  } cases[] = {
      {"hello world", {"hello", "world"}},
      {"a  b", {"a", "", "b"}},  // empty pieces between separators are kept
      {"", {""}},
      {"漢字", {"漢", "字"}},
      {"漢ab", {"漢"}},                   // the trailing Latin run is dropped
      {"ab漢cd 字", {"ab", "漢", "字"}},  // runs before a CJK unit are kept
      {"東京 tower", {"東", "京", "tower"}},
      {"한국어", {"한", "국", "어"}},
  };
  for (const Case& c : cases) {
    auto block = line(c.text, 0, 0, 1, 1);
    EXPECT_EQ(utf8(block->wordsInBlock()), c.words) << c.text;
  }
  auto nil = RVRecognitionBlock::initWithText(std::nullopt, Rect{}, 0, RVRecognitionBlockLevelLine);
  EXPECT_TRUE(nil->wordsInBlock().empty());
}

TEST(BlockAssembly, VerticalTextGoesOneUnitPerLine) {
  auto tall = line("漢字文", 0, 0, 0.02, 0.2);
  EXPECT_EQ(tall->writingDirection(), RVWritingDirectionVertical);
  EXPECT_EQ(toUTF8(*tall->textUsingWritingDirection()), "漢\n字\n文");
  auto wide = line("漢字文", 0, 0, 0.2, 0.02);
  EXPECT_EQ(wide->writingDirection(), RVWritingDirectionHorizontal);
  EXPECT_EQ(toUTF8(*wide->textUsingWritingDirection()), "漢字文");
  EXPECT_EQ(line("ab", 0, 0, 0.02, 0.2)->writingDirection(), RVWritingDirectionHorizontal);
  EXPECT_EQ(line("漢", 0, 0, 0.02, 0.2)->writingDirection(), RVWritingDirectionHorizontal);
  // A supplementary ideograph is split into its two surrogates, one per line.
  auto pair = RVRecognitionBlock::initWithText(String(u"\U00020000x"), Rect{0, 0, 0.02, 0.2}, 0,
                                               RVRecognitionBlockLevelLine);
  EXPECT_EQ(*pair->textUsingWritingDirection(), String(u"\xD840\n\xDC00\nx"));
}

TEST(BlockAssembly, CJKDetection) {
  struct Case {
    const char16_t* text;
    bool cjk;
  } cases[] = {
      {u"plain ASCII", false}, {u"Ünïcödé", false}, {u"漢", true},      {u"ひらがな", true},
      {u"カタカナ", true},     {u"한", true},       {u"。", true},      {u"\U00020000", true},
      {u"\xD840", false},      {u"ＡＢＣ", false},  {u"\u3000", false}, {u"", false},
  };
  for (const Case& c : cases) EXPECT_EQ(containsCJKCharacter(c.text), c.cjk) << toUTF8(c.text);
}

TEST(BlockAssembly, ChildLookupAndRemovalByValue) {
  auto p = RVRecognitionBlock::initWithText(u"", Rect{}, 0, RVRecognitionBlockLevelParagraph);
  auto a = line("a", 0, 0.5, 1, 0.1), b = line("b", 0, 0.3, 1, 0.1);
  auto aTwin = line("a", 0, 0.5, 1, 0.1);  // equal by value, another object
  p->childBlocks()->assign({a, b, aTwin});
  EXPECT_EQ(p->childBlockForString(u"zzz", true), nullptr);
  EXPECT_EQ(p->childBlocks()->size(), 3u);
  EXPECT_EQ(p->childBlockForString(u"b", false), b);
  EXPECT_EQ(p->childBlocks()->size(), 3u);
  EXPECT_EQ(p->childBlockForString(u"a", true), a);
  EXPECT_EQ(texts(*p->childBlocks()), (std::vector<std::string>{"b"}));
}

}  // namespace
}  // namespace corvel
