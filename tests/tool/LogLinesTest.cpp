#include <gtest/gtest.h>

#include <fstream>
#include <regex>
#include <sstream>

#include "support/TestSupport.h"

namespace corvel {
namespace {

// Regression: the library's log line ("Error: Error Domain=...") from a job's worker thread
// landed on stderr in the middle of corvel's own message about the same failure. Two hundred
// failing jobs made that happen several times a run; every line must now be whole.
TEST(ToolLog, LibraryLogLinesNeverSplitTheProgramsMessages) {
  testing::TempDir dir;
  std::string inputs;
  for (int i = 0; i < 200; ++i) {
    std::string name = "junk" + std::to_string(i) + ".png";
    std::ofstream(dir.file(name)) << "not a picture";
    inputs += " '" + dir.file(name) + "'";
  }
  auto run =
      testing::runCommand(std::string(CORVEL_TOOL_PATH) + " ocr" + inputs + " 2>&1 >/dev/null");
  EXPECT_EQ(run.status, 1);
  const std::regex whole(
      "Error: Error Domain=.*\\}|corvel: .*junk[0-9]+\\.png: .*\\(com\\.corvelworks\\.\\w+ "
      "\\d+\\)");
  std::istringstream lines(run.output);
  int count = 0;
  for (std::string line; std::getline(lines, line); ++count)
    EXPECT_TRUE(std::regex_match(line, whole)) << line;
  EXPECT_EQ(count, 400);  // a log line and a message for each input
}

}  // namespace
}  // namespace corvel
