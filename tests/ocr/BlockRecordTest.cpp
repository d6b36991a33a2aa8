// The block record: initialisers, record geometry, equality and the dictionary form.
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

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

std::shared_ptr<RVRecognitionBlock> block(std::optional<String> text, double confidence,
                                          Rect box = Rect{0.1, 0.2, 0.3, 0.4},
                                          std::uint64_t level = RVRecognitionBlockLevelLine) {
  return RVRecognitionBlock::initWithText(std::move(text), box, confidence,
                                          static_cast<RVRecognitionBlockLevel>(level));
}

// The defaults every initialiser sets are checked on blocks read back from the dictionary form.
TEST(BlockRecord, ContainerInitialisersShareTheirChild) {
  auto leaf = line("abc", 0.1, 0.2, 0.3, 0.4, 98.5);
  for (auto& [container, level] :
       {std::pair{RVRecognitionBlock::initColumnWithBlock(leaf), RVRecognitionBlockLevelColumn},
        std::pair{RVRecognitionBlock::initParagraphWithBlock(leaf),
                  RVRecognitionBlockLevelParagraph}}) {
    EXPECT_TRUE(container->isEqual(block(u"abc", 98.5, leaf->boundingBox(), level)));
    ASSERT_EQ(container->children().size(), 1u);
    EXPECT_EQ(container->children().front(), leaf);  // shared, not copied
  }
  EXPECT_EQ(RVRecognitionBlock::initColumnWithBlock(nullptr), nullptr);
}

TEST(BlockRecord, RecordGeometryDescriptionAndCopy) {
  auto b = line("abc", 0, 0, 0, 0, 98.5);
  b->setBoundingBox(Rect{0.1, 0.2, 0.3, 0.4}, RVBoundingBoxOriginTopLeft);
  EXPECT_EQ(b->boundingBox(), (Rect{0.1, 1.0 - (0.2 + 0.4), 0.3, 0.4}));
  b->setBoundingBox(Rect{0.1, 0.2, 0.3, 0.4}, 3);  // any other origin is bottom-left
  EXPECT_EQ(b->boundingBox(), (Rect{0.1, 0.2, 0.3, 0.4}));
  EXPECT_EQ(b->boundingBoxAtImageOfSize(Size{1000, 500}), (Rect{100, 100, 300, 200}));

  EXPECT_EQ(toUTF8(b->description()), "(98.50%) 'abc'");
}

// A host's own kind of block, for the class test of equality.
struct HostBlock : RVRecognitionBlock {
  HostBlock()
      : RVRecognitionBlock(u"word", Rect{0.1, 0.2, 0.3, 0.4}, 50, RVRecognitionBlockLevelLine) {}
};

TEST(BlockRecord, EqualityByValue) {
  auto base = block(u"word", 50);
  auto host = std::make_shared<HostBlock>();
  auto nan = block(u"n", 1, Rect{kNaN, 0, 1, 1});
  auto twin = block(u"word", 50);  // children, match type and spacing take no part
  twin->setMatchType(RVBlockMatchSameColumn);
  twin->setLineSpacing(0.5);
  twin->childBlocks()->push_back(block(u"child", 1));
  struct Case {
    const char* name;
    std::shared_ptr<RVRecognitionBlock> a, b;
    bool equal;
  } cases[] = {
      {"confidence 1e-8 apart", base, block(u"word", 50 + 1e-8), true},
      {"confidence 1e-6 apart", base, block(u"word", 50 + 1e-6), false},
      {"other level", base, block(u"word", 50, Rect{0.1, 0.2, 0.3, 0.4}, 1), false},
      {"box one bit off", base, block(u"word", 50, Rect{0.1, 0.2, 0.3, std::nextafter(0.4, 1)}),
       false},
      {"null", base, nullptr, false},
      {"twin with children", base, twin, true},
      {"two nil texts", block(std::nullopt, 1), block(std::nullopt, 1), true},
      {"nil and empty text", block(std::nullopt, 1), block(u"", 1), false},
      {"NaN box and itself", nan, nan, true},
      {"NaN box and its twin", nan, block(u"n", 1, Rect{kNaN, 0, 1, 1}), false},
      // Regression: equality ignored the class, so a host's subclass equalled a plain block.
      {"plain block and host subclass", base, host, true},
      {"host subclass and plain block", host, base, false},
  };
  for (const Case& c : cases) EXPECT_EQ(c.a->isEqual(c.b), c.equal) << c.name;
  // Equal blocks hash alike whatever their children, as hashed collections need.
  EXPECT_EQ(base->hash(), twin->hash());
  EXPECT_NE(base->hash(), block(u"word", 51)->hash());
  // Confidences no integer holds get defined hashes (a bare cast would be undefined):
  // NaN as 0, the too large saturated.
  EXPECT_EQ(block(std::nullopt, kNaN)->hash(), block(std::nullopt, 0)->hash());
  EXPECT_EQ(block(std::nullopt, 1e300)->hash(), block(std::nullopt, 1e301)->hash());
}

// ---- Dictionary form.

void expectSameTree(const RVRecognitionBlock& got, const RVRecognitionBlock& want) {
  EXPECT_EQ(got.text(), want.text());
  EXPECT_EQ(got.boundingBox(), want.boundingBox());
  EXPECT_EQ(got.level(), want.level());
  EXPECT_EQ(got.confidence(), static_cast<double>(static_cast<float>(want.confidence())));
  EXPECT_EQ(got.matchType(), RVBlockMatchNone);
  EXPECT_EQ(got.lineSpacing(), spacingUndefined);
  ASSERT_EQ(got.children().size(), want.children().size());
  for (std::size_t i = 0; i < got.children().size(); ++i)
    expectSameTree(*got.children()[i], *want.children()[i]);
}

TEST(BlockDictionary, RoundTripsThroughXMLAndBinaryPlistFiles) {
  testing::TempDir dir;
  auto tree = RVRecognitionBlock::initColumnWithBlock(line("Hello", 0.1, 0.8, 0.3, 0.02, 98.7));
  tree->addChildBlock(line("world", 0.1, 0.775, 0.25, 0.02, 1.0 / 3.0), RVBlockMatchSameColumn);
  for (auto format : {PropertyList::Format::XML, PropertyList::Format::Binary}) {
    std::string path = dir.file(format == PropertyList::Format::XML ? "t.xml" : "t.bplist");
    ASSERT_TRUE(tree->writeToFile(path, format));
    auto back = RVRecognitionBlock::readFromFile(path);
    ASSERT_NE(back, nullptr);
    expectSameTree(*back, *tree);
    EXPECT_EQ(back->confidence(), 98.69999694824219);  // through single precision
  }
  auto bytes = readFile(dir.file("t.xml"));
  ASSERT_TRUE(bytes);
  EXPECT_NE(std::string(bytes->begin(), bytes->end()).find("<key>childBlocks</key>"),
            std::string::npos);
  EXPECT_EQ(RVRecognitionBlock::readFromFile(dir.file("missing.plist")), nullptr);
  EXPECT_FALSE(tree->writeToFile(dir.file("no/such/dir/t.plist"), PropertyList::Format::XML));
  // "type" is written (the match type) though never read back; a nil text has no key.
  auto info = tree->blockInformation();
  EXPECT_EQ((*info.find("childBlocks")->array())[1].find("type")->unsignedIntegerValue(), 2u);
  EXPECT_EQ(block(std::nullopt, 0)->blockInformation().find("text"), nullptr);
}

// Text, box, confidence, level and child count in one line.
std::string summary(const RVRecognitionBlock& b) {
  return toUTF8(b.description()) + " " + stringFromRect(b.boundingBox()) + " L" +
         std::to_string(b.level()) + " C" + std::to_string(b.children().size());
}

TEST(BlockDictionary, ReadsIncompleteOrMistypedDictionariesAsTheDefaults) {
  using Dict = PropertyList::Dictionary;
  const std::string nil = "(0.00%) '(null)' {{0, 0}, {0, 0}} L0 C0";
  struct Case {
    const char* name;
    PropertyList info;
    std::string want;
  } cases[] = {
      {"text of wrong type", Dict{{"text", PropertyList(5)}}, nil},
      {"malformed box", Dict{{"boundingBox", PropertyList(u"garbage")}}, nil},
      {"box not a string", Dict{{"boundingBox", PropertyList(1.5)}}, nil},
      {"NaN confidence", Dict{{"confidence", PropertyList(kNaN)}},
       "(nan%) '(null)' {{0, 0}, {0, 0}} L0 C0"},
      {"level through 32 bits", Dict{{"level", PropertyList(std::uint64_t{0x100000002})}},
       "(0.00%) '(null)' {{0, 0}, {0, 0}} L2 C0"},
      {"children not an array", Dict{{"childBlocks", PropertyList(u"x")}}, nil},
      {"non-dictionary child skipped",
       Dict{{"text", PropertyList(u"p")},
            {"childBlocks",
             PropertyList(PropertyList::Array{PropertyList(3), PropertyList(Dict{})})}},
       "(0.00%) 'p' {{0, 0}, {0, 0}} L0 C1"},
  };
  for (const Case& c : cases) {
    auto b = RVRecognitionBlock::createBlockFromInfo(c.info);
    ASSERT_NE(b, nullptr) << c.name;
    EXPECT_EQ(summary(*b), c.want) << c.name;
  }
  EXPECT_EQ(RVRecognitionBlock::createBlockFromInfo(PropertyList(u"not a dictionary")), nullptr);
}

TEST(BlockDictionary, DeepOrCyclicTreesStayFinite) {
  // A block that is its own child: writing must still end, cut at the depth limit.
  auto loop = line("loop", 0, 0, 1, 1);
  loop->childBlocks()->push_back(loop);
  PropertyList info = loop->blockInformation();
  loop->childBlocks()->clear();  // break the cycle so the block is freed
  int depth = 0;
  for (const PropertyList* p = &info; !p->find("childBlocks")->array()->empty(); ++depth)
    p = &p->find("childBlocks")->array()->front();
  EXPECT_EQ(depth, RVRecognitionBlock::kMaxTreeDepth);
  // Reading a tree deeper than the limit cuts it there.
  PropertyList deep = PropertyList::Dictionary{};
  for (int i = 0; i < 100; ++i)
    deep = PropertyList::Dictionary{{"childBlocks", PropertyList(PropertyList::Array{deep})}};
  auto b = RVRecognitionBlock::createBlockFromInfo(deep);
  ASSERT_NE(b, nullptr);
  int levels = 0;
  for (auto c = b; !c->children().empty(); ++levels) c = c->children().front();
  EXPECT_EQ(levels, RVRecognitionBlock::kMaxTreeDepth);
}

}  // namespace
}  // namespace corvel
