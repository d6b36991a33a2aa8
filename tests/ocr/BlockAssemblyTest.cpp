// Assembling containers and producing their texts, words and writing direction.
#include <gtest/gtest.h>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVRecognitionBlock.h"

namespace corvel {
namespace {

using testing::line;
using testing::text;
using Texts = std::vector<std::string>;

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
