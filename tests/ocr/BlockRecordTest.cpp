// The block record: initialisers, record geometry, equality, hash and the dictionary form.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/platform/Files.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using testing::line;
using testing::text;

TEST(BlockRecord, NewBlocksStartUnmatchedWithUndefinedSpacingAndAnEmptyChildArray) {
  auto block = line("abc", 0.1, 0.2, 0.3, 0.4, 98.5);
  EXPECT_EQ(block->lineSpacing(), -1000.0);
  EXPECT_EQ(block->matchType(), RVBlockMatchNone);
  ASSERT_NE(block->childBlocks(), nullptr);
  EXPECT_TRUE(block->childBlocks()->empty());

  auto column = RVRecognitionBlock::initColumnWithBlock(block);
  auto paragraph = RVRecognitionBlock::initParagraphWithBlock(block);
  for (auto& [container, level] : {std::pair{column, RVRecognitionBlockLevelColumn},
                                   std::pair{paragraph, RVRecognitionBlockLevelParagraph}}) {
    EXPECT_EQ(container->level(), level);
    EXPECT_EQ(text(container), "abc");
    EXPECT_EQ(container->boundingBox(), block->boundingBox());
    EXPECT_EQ(container->confidence(), 98.5);
    ASSERT_EQ(container->childBlocks()->size(), 1u);
    EXPECT_EQ(container->childBlocks()->front(), block);  // shared, not copied
  }
  EXPECT_EQ(RVRecognitionBlock::initColumnWithBlock(nullptr), nullptr);

  // Nothing is validated: nil text and odd levels are stored as given.
  auto odd = RVRecognitionBlock::initWithText(std::nullopt, Rect{-1, 2, -3, 4}, -5,
                                              static_cast<RVRecognitionBlockLevel>(7));
  EXPECT_FALSE(odd->text().has_value());
  EXPECT_EQ(odd->level(), 7u);
  odd->setChildBlocks(nullptr);
  EXPECT_NE(odd->childBlocks(), nullptr);
}

TEST(BlockRecord, RecordGeometry) {
  auto block = line("", 0, 0, 0, 0);
  block->setBoundingBox(Rect{0.1, 0.2, 0.3, 0.4}, RVBoundingBoxOriginTopLeft);
  EXPECT_EQ(block->boundingBox(), (Rect{0.1, 1.0 - (0.2 + 0.4), 0.3, 0.4}));
  EXPECT_DOUBLE_EQ(block->boundingBox().origin.y, 0.4);
  for (std::uint64_t origin : {0u, 1u, 3u}) {
    block->setBoundingBox(Rect{0.1, 0.2, 0.3, 0.4}, origin);
    EXPECT_EQ(block->boundingBox(), (Rect{0.1, 0.2, 0.3, 0.4})) << origin;
  }
  Rect scaled = block->boundingBoxAtImageOfSize(Size{1000, 500});
  EXPECT_DOUBLE_EQ(scaled.origin.x, 100);
  EXPECT_DOUBLE_EQ(scaled.origin.y, 100);
  EXPECT_DOUBLE_EQ(scaled.size.width, 300);
  EXPECT_DOUBLE_EQ(scaled.size.height, 200);
  EXPECT_EQ(block->lineSpacingForHeight(2), -2000.0);  // unset spacing is not special-cased
  block->setLineSpacing(0.003);
  EXPECT_DOUBLE_EQ(block->lineSpacingForHeight(1000), 3);
}

TEST(BlockRecord, DescriptionAndCopy) {
  EXPECT_EQ(toUTF8(line("abc", 0, 0, 1, 1, 98.5)->description()), "(98.50%) 'abc'");
  EXPECT_EQ(toUTF8(line("x", 0, 0, 1, 1, 7.125)->description()), "(7.12%) 'x'");
  auto block = line("abc", 0, 0, 1, 1);
  EXPECT_EQ(block->copy(), block);
}

TEST(BlockRecord, EqualityByValue) {
  const Rect box{0.1, 0.2, 0.3, 0.4};
  auto make = [&](const char* t, double confidence, Rect r = Rect{0.1, 0.2, 0.3, 0.4},
                  RVRecognitionBlockLevel level = RVRecognitionBlockLevelLine) {
    return RVRecognitionBlock::initWithText(fromUTF8(t), r, confidence, level);
  };
  auto base = make("word", 50);
  struct Case {
    const char* name;
    std::shared_ptr<RVRecognitionBlock> other;
    bool equal;
  } cases[] = {
      {"confidence 1e-8 apart", make("word", 50 + 1e-8), true},
      {"confidence 1e-6 apart", make("word", 50 + 1e-6), false},
      {"other text", make("words", 50), false},
      {"other level", make("word", 50, box, RVRecognitionBlockLevelParagraph), false},
      {"box differs in the last bit", make("word", 50, Rect{0.1, 0.2, 0.3, std::nextafter(0.4, 1)}),
       false},
      {"null", nullptr, false},
  };
  for (const Case& c : cases) EXPECT_EQ(base->isEqual(c.other), c.equal) << c.name;

  // Children, match type and spacing take no part.
  auto twin = make("word", 50);
  twin->setMatchType(RVBlockMatchSameColumn);
  twin->setLineSpacing(0.5);
  twin->childBlocks()->push_back(make("child", 1));
  EXPECT_TRUE(base->isEqual(twin));
  // Two nil texts are equal; a nil and an empty text are not.
  auto nil1 = RVRecognitionBlock::initWithText(std::nullopt, box, 1, RVRecognitionBlockLevelLine);
  auto nil2 = RVRecognitionBlock::initWithText(std::nullopt, box, 1, RVRecognitionBlockLevelLine);
  EXPECT_TRUE(nil1->isEqual(nil2));
  EXPECT_FALSE(nil1->isEqual(make("", 1)));
  // A NaN box is equal to the block itself only.
  double nan = std::numeric_limits<double>::quiet_NaN();
  auto nanBlock = make("n", 1, Rect{nan, 0, 1, 1});
  EXPECT_TRUE(nanBlock->isEqual(nanBlock));
  EXPECT_FALSE(nanBlock->isEqual(make("n", 1, Rect{nan, 0, 1, 1})));
}

TEST(BlockRecord, HashFollowsItsFormulaInWrappingArithmetic) {
  auto nilText = [](double confidence, RVRecognitionBlockLevel level) {
    return RVRecognitionBlock::initWithText(std::nullopt, Rect{}, confidence, level)->hash();
  };
  EXPECT_EQ(nilText(0, RVRecognitionBlockLevelLine), 2u);
  EXPECT_EQ(nilText(98.5, RVRecognitionBlockLevelParagraph), 1ull + 985000ull * 11813ull);
  // Truncation, not rounding.
  EXPECT_EQ(nilText(0.00019, RVRecognitionBlockLevelColumn), 11813u);
  // NaN and negative confidences give 0; values past 2^64 saturate, then wrap.
  EXPECT_EQ(nilText(std::numeric_limits<double>::quiet_NaN(), RVRecognitionBlockLevelLine), 2u);
  EXPECT_EQ(nilText(-5, RVRecognitionBlockLevelLine), 2u);
  EXPECT_EQ(nilText(1e300, RVRecognitionBlockLevelLine), 2u + UINT64_MAX * 11813u);
  // The text term: FNV-1a of "a" is 0xaf63dc4c8601ec8c.
  auto a = RVRecognitionBlock::initWithText(u"a", Rect{}, 0, RVRecognitionBlockLevelColumn);
  EXPECT_EQ(a->hash(), 0xaf63dc4c8601ec8cull * 13411u);
}

// ---- Dictionary form.

std::shared_ptr<RVRecognitionBlock> sampleTree() {
  auto first = line("Hello", 0.1, 0.8, 0.3, 0.02, 98.7);
  auto second = line("world", 0.1, 0.775, 0.25, 0.02, 1.0 / 3.0);
  auto column = RVRecognitionBlock::initColumnWithBlock(first);
  column->addChildBlock(second, RVBlockMatchSameColumn);
  return column;
}

void expectSameTree(const RVRecognitionBlock& got, const RVRecognitionBlock& want) {
  EXPECT_EQ(got.text(), want.text());
  EXPECT_EQ(got.boundingBox(), want.boundingBox());
  EXPECT_EQ(got.level(), want.level());
  EXPECT_EQ(got.confidence(), static_cast<double>(static_cast<float>(want.confidence())));
  EXPECT_EQ(got.matchType(), RVBlockMatchNone);
  EXPECT_EQ(got.lineSpacing(), spacingUndefined);
  ASSERT_EQ(got.childBlocks()->size(), want.childBlocks()->size());
  for (std::size_t i = 0; i < got.childBlocks()->size(); ++i)
    expectSameTree(*(*got.childBlocks())[i], *(*want.childBlocks())[i]);
}

TEST(BlockDictionary, RoundTripsThroughXMLAndBinaryPlistFiles) {
  testing::TempDir dir;
  auto tree = sampleTree();
  for (auto format : {PropertyList::Format::XML, PropertyList::Format::Binary}) {
    std::string path = dir.file(format == PropertyList::Format::XML ? "t.xml" : "t.bplist");
    ASSERT_TRUE(tree->writeToFile(path, format));
    auto back = RVRecognitionBlock::readFromFile(path);
    ASSERT_NE(back, nullptr);
    expectSameTree(*back, *tree);
    // Confidence comes back through single precision: 98.7 is not 98.7 any more.
    EXPECT_NE(back->confidence(), 98.7);
    EXPECT_EQ(back->confidence(), 98.69999694824219);
  }
  auto bytes = readFile(dir.file("t.xml"));
  ASSERT_TRUE(bytes);
  EXPECT_NE(std::string(bytes->begin(), bytes->end()).find("<key>childBlocks</key>"),
            std::string::npos);
  EXPECT_EQ(RVRecognitionBlock::readFromFile(dir.file("missing.plist")), nullptr);
  // "type" is written (the match type) though never read back; a nil text has no key.
  auto info = tree->blockInformation();
  EXPECT_EQ((*info.find("childBlocks")->array())[1].find("type")->unsignedIntegerValue(), 2u);
  auto nil = RVRecognitionBlock::initWithText(std::nullopt, Rect{}, 0, RVRecognitionBlockLevelLine);
  EXPECT_EQ(nil->blockInformation().find("text"), nullptr);
  EXPECT_FALSE(tree->writeToFile(dir.file("no/such/dir/t.plist"), PropertyList::Format::XML));
}

TEST(BlockDictionary, ReadsIncompleteOrMistypedDictionariesAsTheDefaults) {
  using Dict = PropertyList::Dictionary;
  using Array = PropertyList::Array;
  struct Case {
    const char* name;
    PropertyList info;
    std::optional<String> text;
    Rect box;
    double confidence;
    std::uint64_t level;
    std::size_t children;
  } cases[] = {
      {"empty", Dict{}, std::nullopt, RectZero, 0, 0, 0},
      {"text of wrong type", Dict{{"text", PropertyList(5)}}, std::nullopt, RectZero, 0, 0, 0},
      {"malformed box", Dict{{"boundingBox", PropertyList(u"garbage")}}, std::nullopt, RectZero, 0,
       0, 0},
      {"box not a string", Dict{{"boundingBox", PropertyList(1.5)}}, std::nullopt, RectZero, 0, 0,
       0},
      {"confidence as string", Dict{{"confidence", PropertyList(u"42.5")}}, std::nullopt, RectZero,
       42.5, 0, 0},
      {"level through 32 bits", Dict{{"level", PropertyList(std::uint64_t{0x100000002})}},
       std::nullopt, RectZero, 0, 2, 0},
      {"children not an array", Dict{{"childBlocks", PropertyList(u"x")}}, std::nullopt, RectZero,
       0, 0, 0},
      {"non-dictionary child skipped",
       Dict{{"text", PropertyList(u"p")},
            {"childBlocks", PropertyList(Array{PropertyList(3), PropertyList(Dict{})})}},
       u"p", RectZero, 0, 0, 1},
      {"NaN confidence", Dict{{"confidence", PropertyList(std::nan(""))}}, std::nullopt, RectZero,
       std::nan(""), 0, 0},
  };
  for (const Case& c : cases) {
    auto block = RVRecognitionBlock::createBlockFromInfo(c.info);
    ASSERT_NE(block, nullptr) << c.name;
    EXPECT_EQ(block->text(), c.text) << c.name;
    EXPECT_EQ(block->boundingBox(), c.box) << c.name;
    if (std::isnan(c.confidence)) {
      EXPECT_TRUE(std::isnan(block->confidence())) << c.name;
    } else {
      EXPECT_EQ(block->confidence(), c.confidence) << c.name;
    }
    EXPECT_EQ(block->level(), c.level) << c.name;
    EXPECT_EQ(block->childBlocks()->size(), c.children) << c.name;
  }
  EXPECT_EQ(RVRecognitionBlock::createBlockFromInfo(PropertyList(u"not a dictionary")), nullptr);
}

TEST(BlockDictionary, DeepOrCyclicTreesStayFinite) {
  // A block that is its own child: writing must still end.
  auto loop = line("loop", 0, 0, 1, 1);
  loop->childBlocks()->push_back(loop);
  PropertyList info = loop->blockInformation();
  int depth = 0;
  for (const PropertyList* p = &info; !p->find("childBlocks")->array()->empty(); ++depth)
    p = &p->find("childBlocks")->array()->front();
  EXPECT_EQ(depth, RVRecognitionBlock::kMaxTreeDepth);
  loop->childBlocks()->clear();  // break the cycle so the block is freed

  // Reading a tree deeper than the limit cuts it there.
  PropertyList deep = PropertyList::Dictionary{};
  for (int i = 0; i < 100; ++i)
    deep = PropertyList::Dictionary{{"childBlocks", PropertyList(PropertyList::Array{deep})}};
  auto block = RVRecognitionBlock::createBlockFromInfo(deep);
  ASSERT_NE(block, nullptr);
  int levels = 0;
  for (auto b = block; !b->childBlocks()->empty(); ++levels) b = b->childBlocks()->front();
  EXPECT_EQ(levels, RVRecognitionBlock::kMaxTreeDepth);
}

}  // namespace
}  // namespace corvel
