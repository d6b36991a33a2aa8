// `corvel layout`: the reading order of line boxes from files, and what it refuses.
#include <gtest/gtest.h>

#include <fstream>
#include <nlohmann/json.hpp>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/platform/Files.h"
#include "ocr/BlockTestHelpers.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using nlohmann::json;
using testing::articleLines;

const std::string kArticle = testing::fixturePath("layout/article.json");

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

testing::CommandResult layout(const std::string& args) { return testing::corvel("layout " + args); }

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
    auto run = layout("'" + path + "' 2>&1");
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

TEST(LayoutCommand, PrintsTheReadingOrderTextOfJSONAndPlistPages) {
  PropertyList::Array infos;
  auto analyser = RVTextLayoutAnalyser::init();
  for (const auto& block : articleLines()) {
    infos.push_back(block->blockInformation());
    analyser->addRecognitionBlock(block);
  }
  analyser->analyse(Size{2480, 3508}, RVWritingDirectionHorizontal);
  // The library's reading of the page, whose order the layout suite checks.
  const std::string articleText = toUTF8(analyser->text());
  testing::TempDir dir;
  // Binary property lists go through the same reader as XML ones.
  std::vector<std::string> pages = {kArticle, dir.file("page.plist")};
  ASSERT_TRUE(PropertyList(infos).writeToFile(pages[1], PropertyList::Format::XML));
  for (const std::string& page : pages) {
    auto result = layout(page);
    EXPECT_EQ(result.status, 0) << page;
    EXPECT_EQ(result.output, articleText + "\n") << page;
  }
}

TEST(LayoutCommand, JsonIsTheColumnTreeInTheDictionaryForm) {
  auto result = layout("--json " + kArticle);
  ASSERT_EQ(result.status, 0);
  json columns = json::parse(result.output);
  ASSERT_EQ(columns.size(), 3u);
  // The caption, folded into the left column, is its third paragraph, of one line.
  const json& caption = columns[1]["childBlocks"][2];
  EXPECT_EQ(std::tuple(columns[1]["level"], caption["level"], caption["childBlocks"][0]["level"]),
            std::tuple(0, 1, 2));
  EXPECT_EQ(caption["text"], "Fig. 1: Spraint sites along the lower Wend");
  EXPECT_EQ(columns[0]["boundingBox"], "{{0.2, 0.9}, {0.6, 0.034}}");
}

TEST(LayoutCommand, MalformedInputIsAMisuse) {
  testing::TempDir dir;
  auto write = [&](const std::string& content) {
    std::string path = dir.file("page.json");
    EXPECT_TRUE(writeFileAtomically(path, Data(content.begin(), content.end())));
    return path;
  };
  struct Case {
    const char* name;
    std::string content;
    const char* message;
  } cases[] = {
      {"not JSON", "[{\"text\": ", "is not valid JSON"},
      {"not an array", "{\"text\": \"x\"}", "must hold an array"},
      {"element not a dictionary", "[{\"text\": \"x\"}, 3]", "element 1 is not a block"},
      {"neither JSON nor plist", "hello", "neither JSON nor a property list"},
      {"too deep", std::string(300, '[') + std::string(300, ']'), "nested too deeply"},
      // A box that does not read is refused, not taken as the zero box.
      {"no box", "[{}]", "element 0: boundingBox missing"},
      {"box not text", "[{\"boundingBox\": 7}]", "boundingBox missing"},
      {"box short of a number", "[{\"boundingBox\": \"{{0.1, 0.2}, {0.3}}\"}]", "is not {{x, y}"},
      {"child box",
       "[{\"boundingBox\": \"{{0, 0}, {1, 1}}\", \"childBlocks\": [{\"boundingBox\": \"{{a, 0}, "
       "{1, 1}}\"}]}]",
       "element 0 > element 0"},
  };
  for (const Case& c : cases) {
    auto result = layout(write(c.content) + " 2>&1");
    EXPECT_EQ(result.status, 2) << c.name;
    EXPECT_NE(result.output.find(c.message), std::string::npos) << c.name << ": " << result.output;
  }
  for (std::string args : {dir.file("missing"), std::string(), "--bogus " + kArticle})
    EXPECT_EQ(layout(args + " 2>/dev/null").status, 2) << args;
  // An empty layout is "found nothing".
  auto result = layout(write("[]"));
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.output, "\n");
}

}  // namespace
}  // namespace corvel
