#include <gtest/gtest.h>

#include <fstream>

#include "Corvelbase/RVRecognitionBlock.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

// A block dictionary whose "childBlocks" nest `levels` deep.
PropertyList nestedBlocks(int levels) {
  const PropertyList box(String(u"{{0, 0}, {1, 1}}"));
  PropertyList info = PropertyList::Dictionary{{"text", u"x"}, {"boundingBox", box}};
  for (int i = 0; i < levels; ++i) {
    info = PropertyList::Dictionary{{"childBlocks", PropertyList(PropertyList::Array{info})},
                                    {"boundingBox", box}};
  }
  return info;
}

// Block trees deeper than the limit used to be cut silently; files from outside are now
// refused, and `corvel layout` says why.
TEST(BlockTreeLimit, TreesDeeperThanTheLimitAreRefusedFromFiles) {
  constexpr int kLimit = RVRecognitionBlock::kMaxTreeDepth;
  EXPECT_TRUE(RVRecognitionBlock::isWithinTreeDepth(nestedBlocks(kLimit)));
  EXPECT_FALSE(RVRecognitionBlock::isWithinTreeDepth(nestedBlocks(kLimit + 1)));

  testing::TempDir dir;
  for (int levels : {kLimit, kLimit + 1}) {
    std::string path = dir.file("tree" + std::to_string(levels) + ".plist");
    ASSERT_TRUE(nestedBlocks(levels).writeToFile(path, PropertyList::Format::Binary));
    EXPECT_EQ(RVRecognitionBlock::readFromFile(path) != nullptr, levels == kLimit) << levels;
    ASSERT_TRUE(PropertyList(PropertyList::Array{nestedBlocks(levels)})
                    .writeToFile(path, PropertyList::Format::XML));
    auto run = testing::runCommand(std::string(CORVEL_TOOL_PATH) + " layout '" + path + "' 2>&1");
    if (levels == kLimit) {
      // Read, not refused (its blocks hold no text of their own: "found nothing", 1).
      EXPECT_EQ(run.status, 1) << run.output;
    } else {
      EXPECT_EQ(run.status, 2);
      EXPECT_NE(run.output.find("element 0 nests deeper than 64 block levels"), std::string::npos)
          << run.output;
    }
  }
}

}  // namespace
}  // namespace corvel
