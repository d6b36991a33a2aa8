// Real recognition of the committed fixture pages from end to end: the reading-order
// text must match the page's source within a small character error rate.
#include <gtest/gtest.h>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Platform.h"
#include "OcrTestText.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using namespace std::chrono_literals;

struct Page {
  const char* name;
  std::vector<std::string> codes;
  bool fast;
  double maxErrorRate;
  bool spaced = true;  // Japanese is written without spaces between words
};

struct Result {
  bool delivered = false;
  std::string text;
  std::optional<Error> error;
  std::shared_ptr<RVVisionOCR> job;
};

// Recognises the pages through the shared queue at once, as a host's batch would.
std::vector<Result> recognise(const std::vector<Page>& pages) {
  std::vector<Result> results(pages.size());
  for (std::size_t i = 0; i < pages.size(); ++i) {
    Result* result = &results[i];
    result->job = RVVisionOCR::ocrImageAtPath(
        fromUTF8(testing::fixturePath(std::string("ocr/") + pages[i].name + ".png")),
        pages[i].codes, pages[i].fast,
        [result](const String& text, const std::optional<Error>& error) {
          result->delivered = true;
          result->text = toUTF8(text);
          result->error = error;
        });
  }
  MainQueue::runUntil(
      [&] {
        return std::all_of(results.begin(), results.end(),
                           [](const Result& r) { return r.delivered; });
      },
      300s);
  return results;
}

class OcrPages : public ::testing::Test {
 protected:
  void SetUp() override { PlatformRegistry::setTextRecognizer(TesseractRecognizer::init()); }
  void TearDown() override { PlatformRegistry::setTextRecognizer(nullptr); }
};

TEST_F(OcrPages, TextMatchesEachPagesSourceAndColumnsAreReadInOrder) {
  const std::vector<Page> pages = {
      {"two-columns", {"en-US"}, false, 0.02},
      {"one-column", {"en-US"}, false, 0.02},
      {"french", {"fr-FR"}, true, 0.02},
      {"japanese", {"ja-JP"}, true, 0.05, false},
      // no codes: the language is detected
      {"russian", {}, true, 0.03},
      {"german", {}, false, 0.02},
      {"japanese", {}, true, 0.05, false},
  };
  auto results = recognise(pages);
  for (std::size_t i = 0; i < pages.size(); ++i) {
    const Page& page = pages[i];
    const Result& result = results[i];
    std::string label = std::string(page.name) + (page.codes.empty() ? " (detected)" : "");
    ASSERT_TRUE(result.delivered) << label;
    ASSERT_FALSE(result.error) << label << ": " << result.error->description();
    double rate =
        testing::characterErrorRate(testing::fixtureText(page.name), result.text, page.spaced);
    EXPECT_LT(rate, page.maxErrorRate) << label << "\n" << result.text;
  }
  // Two columns are read column by column under their heading, each paragraph whole.
  const Result& columns = results[0];
  const char* order[] = {"Notes from the Reading Room", "Our first column",  "bought it and filled",
                         "The walls are thick",         "The second column", "Groups of students"};
  std::size_t last = 0;
  for (const char* start : order) {
    std::size_t at = columns.text.find(start);
    ASSERT_NE(at, std::string::npos) << start << "\n" << columns.text;
    EXPECT_GE(at, last) << start << "\n" << columns.text;
    last = at;
  }
  // The analysed tree holds the columns and paragraphs behind that text.
  auto tree = columns.job->layoutAnalyser()->layoutBlocks();
  ASSERT_TRUE(tree);
  EXPECT_GE(tree->size(), 2u);
  for (const auto& column : *tree) {
    EXPECT_EQ(column->level(), RVRecognitionBlockLevelColumn);
    for (const auto& paragraph : column->children()) {
      EXPECT_EQ(paragraph->level(), RVRecognitionBlockLevelParagraph);
    }
  }
}

}  // namespace
}  // namespace corvel
