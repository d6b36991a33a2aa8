// Whole pages: the bundled article, read in recogniser order and shuffled, through the
// library and through `corvel layout`.
#include <gtest/gtest.h>

#include <algorithm>
#include <nlohmann/json.hpp>
#include <random>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/platform/Files.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using nlohmann::json;
using testing::text;

const std::string kArticle = testing::fixturePath("layout/article.json");

// The reading order a person gives the page: heading, left column (the caption that sits
// inside it is glued to the line above, since it arrives unmatched), right column.
constexpr const char* kArticleText = R"(The Quiet Return of the River Otter

For most of the last century the otter was a
rumour on the lower Wend: a print in the mud,
a half-eaten trout on a stone, nothing more.
That has changed. Volunteers who walk the
banks each month now log fresh spraint at
nine of the twelve survey points, and two
holts above the weir are in steady use.Fig. 1: Spraint sites along the lower Wend
The survey began in 2014 with four people
and a borrowed camera trap. It now has
forty walkers and a shared map of sightings.

Cleaner water is the usual explanation, and
the numbers support it: nitrate levels at the
old mill have fallen by a third since 2010.
Yet the walkers credit the hedges too. Where
farmers left a margin of rough grass along
the bank, sightings doubled within two years.
Next spring the group will add thermal
cameras at the weir, hoping to count the
cubs before they leave the holt.)";

RVBlockArray articleLines() {
  auto bytes = readFile(kArticle);
  EXPECT_TRUE(bytes);
  RVBlockArray lines;
  if (!bytes) return lines;
  for (const json& entry : json::parse(bytes->begin(), bytes->end())) {
    lines.push_back(RVRecognitionBlock::initWithText(
        fromUTF8(entry["text"].get<std::string>()),
        rectFromString(entry["boundingBox"].get<std::string>()), entry["confidence"].get<double>(),
        static_cast<RVRecognitionBlockLevel>(entry["level"].get<int>())));
  }
  return lines;
}

// Paragraphs of each column as "line|line|..." strings.
std::vector<std::vector<std::string>> paragraphsOf(const RVBlockArray& columns) {
  std::vector<std::vector<std::string>> out;
  for (const auto& column : columns) {
    auto& paragraphs = out.emplace_back();
    for (const auto& paragraph : *column->childBlocks()) {
      std::string joined;
      for (const auto& l : *paragraph->childBlocks()) joined += text(l) + "|";
      paragraphs.push_back(joined);
    }
  }
  return out;
}

TEST(LayoutPage, ArticleReadsHeadingThenLeftThenRightColumn) {
  auto analyser = RVTextLayoutAnalyser::init();
  analyser->addRecognitionBlocks(articleLines());
  analyser->analyse(Size{2480, 3508}, RVWritingDirectionHorizontal);
  EXPECT_EQ(toUTF8(analyser->text()), kArticleText);
  auto paragraphs = paragraphsOf(*analyser->layoutBlocks());
  ASSERT_EQ(paragraphs.size(), 3u);
  EXPECT_EQ(paragraphs[0].size(), 1u);  // the heading
  EXPECT_EQ(paragraphs[1].size(), 4u);  // three paragraphs and the caption
  EXPECT_EQ(paragraphs[1][2], "Fig. 1: Spraint sites along the lower Wend|");
  EXPECT_EQ(paragraphs[2].size(), 3u);
}

TEST(LayoutPage, OutOfOrderLinesGiveTheSameColumnsAndParagraphs) {
  auto inOrder = RVTextLayoutAnalyser::init();
  inOrder->addRecognitionBlocks(articleLines());
  inOrder->analyse(Size{1, 1}, 0);
  const auto want = paragraphsOf(*inOrder->layoutBlocks());

  std::mt19937 random(20240611);
  for (int round = 0; round < 5; ++round) {
    RVBlockArray lines = articleLines();
    if (round == 0) {
      std::reverse(lines.begin(), lines.end());  // bottom to top
    } else {
      std::shuffle(lines.begin(), lines.end(), random);
    }
    auto analyser = RVTextLayoutAnalyser::init();
    analyser->addRecognitionBlocks(lines);
    analyser->analyse(Size{1, 1}, 0);
    EXPECT_EQ(paragraphsOf(*analyser->layoutBlocks()), want) << "round " << round;
  }
}

// ---- corvel layout.

std::string tool(const std::string& args) { return std::string(CORVEL_TOOL_PATH) + " " + args; }

TEST(LayoutCommand, PrintsTheReadingOrderText) {
  auto result = testing::runCommand(tool("layout " + kArticle));
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.output, std::string(kArticleText) + "\n");
}

TEST(LayoutCommand, ReadsThePageFromXMLAndBinaryPlists) {
  auto bytes = readFile(kArticle);
  ASSERT_TRUE(bytes);
  PropertyList::Array infos;
  for (const auto& block : articleLines()) infos.push_back(block->blockInformation());
  testing::TempDir dir;
  for (auto format : {PropertyList::Format::XML, PropertyList::Format::Binary}) {
    std::string path = dir.file(format == PropertyList::Format::XML ? "page.plist" : "page.bin");
    ASSERT_TRUE(PropertyList(infos).writeToFile(path, format));
    auto result = testing::runCommand(tool("layout " + path));
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.output, std::string(kArticleText) + "\n");
  }
}

TEST(LayoutCommand, JsonIsTheColumnTreeInTheDictionaryForm) {
  auto result = testing::runCommand(tool("layout --json " + kArticle));
  ASSERT_EQ(result.status, 0);
  json columns = json::parse(result.output);
  ASSERT_TRUE(columns.is_array());
  std::vector<std::size_t> paragraphs;
  for (const json& column : columns) {
    EXPECT_EQ(column["level"], 0);
    EXPECT_EQ(column["childBlocks"][0]["level"], 1);
    EXPECT_EQ(column["childBlocks"][0]["childBlocks"][0]["level"], 2);
    paragraphs.push_back(column["childBlocks"].size());
  }
  EXPECT_EQ(paragraphs, (std::vector<std::size_t>{1, 4, 3}));
  // The caption, folded into the left column, is its third paragraph.
  EXPECT_EQ(columns[1]["childBlocks"][2]["text"], "Fig. 1: Spraint sites along the lower Wend");
  EXPECT_EQ(rectFromString(columns[0]["boundingBox"].get<std::string>()),
            (Rect{0.2, 0.9, 0.6, 0.034}));
}

TEST(LayoutCommand, MalformedInputIsAMisuse) {
  testing::TempDir dir;
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
  };
  for (const Case& c : cases) {
    std::string path = dir.file("bad.json");
    ASSERT_TRUE(writeFileAtomically(path, Data(c.content.begin(), c.content.end())));
    auto result = testing::runCommand(tool("layout " + path + " 2>&1"));
    EXPECT_EQ(result.status, 2) << c.name;
    EXPECT_NE(result.output.find(c.message), std::string::npos) << c.name << ": " << result.output;
  }
  EXPECT_EQ(testing::runCommand(tool("layout " + dir.file("missing") + " 2>/dev/null")).status, 2);
  EXPECT_EQ(testing::runCommand(tool("layout 2>/dev/null")).status, 2);
  EXPECT_EQ(testing::runCommand(tool("layout --bogus " + kArticle + " 2>/dev/null")).status, 2);
  // Blocks missing every key are still blocks: an empty page reads as empty text.
  std::string path = dir.file("empty.json");
  std::string content = "[{}, {\"boundingBox\": 7}]";
  ASSERT_TRUE(writeFileAtomically(path, Data(content.begin(), content.end())));
  auto result = testing::runCommand(tool("layout " + path));
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.output, "\n");
}

}  // namespace
}  // namespace corvel
