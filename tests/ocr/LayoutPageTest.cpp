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

// The reading order a person gives the page, as the fixture's line numbers: columns of
// paragraphs of lines. The heading; the left column, with the caption (17) that sits
// inside it; the right column.
using Layout = std::vector<std::vector<std::vector<std::size_t>>>;
const Layout kReading = {
    {{0}}, {{1, 3, 5}, {7, 9, 11, 13}, {17}, {18, 19, 20}}, {{2, 4, 6}, {8, 10, 12}, {14, 15, 16}}};

// Its text: columns a blank line apart, lines a line feed apart, except the caption: it is
// folded in unmatched, so it is glued to the line above.
std::string articleText() {
  RVBlockArray lines = articleLines();
  std::string out;
  for (const auto& column : kReading) {
    std::string joined;
    for (const auto& paragraph : column)
      for (std::size_t i : paragraph)
        joined += (joined.empty() || i == 17 ? "" : "\n") + text(lines.at(i));
    out += (out.empty() ? "" : "\n\n") + joined;
  }
  return out;
}

std::shared_ptr<RVTextLayoutAnalyser> analysed(const RVBlockArray& lines) {
  auto analyser = RVTextLayoutAnalyser::init();
  analyser->addRecognitionBlocks(lines);
  analyser->analyse(Size{2480, 3508}, RVWritingDirectionHorizontal);
  return analyser;
}

// The analysed columns with each line given by its number in `lines`.
Layout layoutOf(const RVTextLayoutAnalyser& analyser, const RVBlockArray& lines) {
  Layout out;
  for (const auto& column : *analyser.layoutBlocks()) {
    auto& paragraphs = out.emplace_back();
    for (const auto& paragraph : column->children()) {
      auto& numbers = paragraphs.emplace_back();
      for (const auto& l : paragraph->children())
        numbers.push_back(
            static_cast<std::size_t>(std::find(lines.begin(), lines.end(), l) - lines.begin()));
    }
  }
  return out;
}

TEST(LayoutPage, ArticleInAnyLineOrderGivesTheReadingOrderColumnsAndParagraphs) {
  std::mt19937 random(20240611);
  // Recogniser order (which also gives the text), bottom to top, shuffled.
  for (int round = 0; round < 6; ++round) {
    RVBlockArray lines = articleLines(), order = lines;
    if (round == 1) std::reverse(order.begin(), order.end());
    if (round > 1) std::shuffle(order.begin(), order.end(), random);
    auto analyser = analysed(order);
    EXPECT_EQ(layoutOf(*analyser, lines), kReading) << "round " << round;
    if (round == 0) {
      EXPECT_EQ(toUTF8(analyser->text()), articleText());
    }
  }
}

// ---- corvel layout.

testing::CommandResult layout(const std::string& args) {
  return testing::runCommand(std::string(CORVEL_TOOL_PATH) + " layout " + args);
}

TEST(LayoutCommand, PrintsTheReadingOrderTextOfJSONAndPlistPages) {
  PropertyList::Array infos;
  for (const auto& block : articleLines()) infos.push_back(block->blockInformation());
  testing::TempDir dir;
  // Binary property lists go through the same reader as XML ones.
  std::vector<std::string> pages = {kArticle, dir.file("page.plist")};
  ASSERT_TRUE(PropertyList(infos).writeToFile(pages[1], PropertyList::Format::XML));
  for (const std::string& page : pages) {
    auto result = layout(page);
    EXPECT_EQ(result.status, 0) << page;
    EXPECT_EQ(result.output, articleText() + "\n") << page;
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
  };
  for (const Case& c : cases) {
    auto result = layout(write(c.content) + " 2>&1");
    EXPECT_EQ(result.status, 2) << c.name;
    EXPECT_NE(result.output.find(c.message), std::string::npos) << c.name << ": " << result.output;
  }
  for (std::string args : {dir.file("missing"), std::string(), "--bogus " + kArticle})
    EXPECT_EQ(layout(args + " 2>/dev/null").status, 2) << args;
  // Blocks missing every key are still blocks: an empty page reads as empty text.
  auto result = layout(write("[{}, {\"boundingBox\": 7}]"));
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.output, "\n");
}

}  // namespace
}  // namespace corvel
