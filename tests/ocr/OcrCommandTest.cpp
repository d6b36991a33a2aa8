// `corvel ocr` and `corvel languages` as a user runs them.
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include "Corvelbase/platform/Image.h"
#include "OcrTestText.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

std::string tool() { return CORVEL_TOOL_PATH; }
std::string page(const std::string& name) { return testing::fixturePath("ocr/" + name + ".png"); }

TEST(OcrCommand, PrintsEachFilesTextAndReportsTheOneThatFails) {
  testing::TempDir dir;
  std::string errors = dir.file("errors.txt");
  auto result = testing::runCommand(tool() + " ocr --fast --lang en-US " + page("sample") + " " +
                                    dir.file("missing.png") + " file://" + page("lines/line-001") +
                                    " 2>" + errors);
  EXPECT_EQ(result.status, 1);
  // Headers in the order given; the failed file gets none.
  std::size_t first = result.output.find("==> " + page("sample") + " <==");
  std::size_t second = result.output.find("==> file://" + page("lines/line-001") + " <==");
  ASSERT_NE(first, std::string::npos) << result.output;
  ASSERT_NE(second, std::string::npos) << result.output;
  EXPECT_LT(first, second);
  EXPECT_EQ(result.output.find("missing.png"), std::string::npos);
  std::string sampleText = result.output.substr(first, second - first);
  sampleText = sampleText.substr(sampleText.find('\n') + 1);
  EXPECT_LT(testing::characterErrorRate(testing::fixtureText("sample"), sampleText), 0.02)
      << sampleText;
  auto stderrText = testing::runCommand("cat " + errors).output;  // names the file and why
  EXPECT_NE(stderrText.find("missing.png"), std::string::npos) << stderrText;
  EXPECT_NE(stderrText.find("cannot be read"), std::string::npos) << stderrText;
}

TEST(OcrCommand, JsonGivesTheTextAndTheBlockTreeAndTheOverlayIsAPictureOfThePage) {
  testing::TempDir dir;
  auto result = testing::runCommand(tool() + " ocr --json --fast --overlay " +
                                    dir.file("over.png") + " " + page("two-columns"));
  ASSERT_EQ(result.status, 0) << result.output;
  auto object = nlohmann::json::parse(result.output, nullptr, false);
  ASSERT_FALSE(object.is_discarded()) << result.output;
  EXPECT_EQ(object["file"], page("two-columns"));
  EXPECT_LT(testing::characterErrorRate(testing::fixtureText("two-columns"),
                                        object["text"].get<std::string>()),
            0.02);
  // The tree is encoded as `corvel layout --json` does (checked in full there): columns.
  ASSERT_GE(object["blocks"].size(), 2u) << object["blocks"];
  EXPECT_EQ(object["blocks"][0]["level"], 0);
  auto overlay = Image::initByReferencingFile(dir.file("over.png"));
  ASSERT_TRUE(overlay->bitmap()) << overlay->failureReason();
  EXPECT_EQ(overlay->size(), Image::initByReferencingFile(page("two-columns"))->size());
}

TEST(OcrCommand, MisuseExitsWithTwo) {
  // no file, an option without its value, an unknown option
  for (std::string args : {"", "--fast", "--lang", "--bogus x.png", "--overlay"}) {
    EXPECT_EQ(testing::runCommand(tool() + " ocr " + args + " 2>/dev/null").status, 2) << args;
  }
}

TEST(LanguagesCommand, ListsTheCatalogueWithWhatIsInstalled) {
  auto result = testing::runCommand(tool() + " languages");
  ASSERT_EQ(result.status, 0);
  std::size_t lines =
      static_cast<std::size_t>(std::count(result.output.begin(), result.output.end(), '\n'));
  EXPECT_EQ(lines, 15u);  // a heading and 14 entries
  // Simplified Chinese is the one entry without fast recognition.
  EXPECT_NE(result.output.find("zh-Hans   zh-Hans  Chinese Simplified     yes        no    first"),
            std::string::npos)
      << result.output;
  EXPECT_NE(result.output.find("yue-Hans  zh-Hans  Cantonese Simplified   yes        yes   first"),
            std::string::npos)
      << result.output;
}

}  // namespace
}  // namespace corvel
