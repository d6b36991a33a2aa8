#include <gtest/gtest.h>

#include <fstream>
#include <regex>
#include <sstream>

#include "support/TestSupport.h"

namespace corvel {
namespace {

// Regression: the library's log line ("Error: Error Domain=...") from a job's worker thread
// landed on stderr in the middle of corvel's own message about the same failure. Two hundred
// failing inputs made that happen several times a run; every line must now be whole, and
// each failure is one line (the library's own log lines only come with --verbose).
TEST(ToolLog, LibraryLogLinesNeverSplitTheProgramsMessages) {
  testing::TempDir dir;
  std::string inputs;
  for (int i = 0; i < 200; ++i) {
    std::string name = "junk" + std::to_string(i) + ".png";
    std::ofstream(dir.file(name)) << "not a picture";
    inputs += " '" + dir.file(name) + "'";
  }
  for (std::string verbose : {"", " --verbose"}) {
    auto run = testing::runCommand(std::string(CORVEL_TOOL_PATH) + " ocr" + verbose + inputs +
                                   " 2>&1 >/dev/null");
    EXPECT_EQ(run.status, 2);  // no input could be read
    const std::regex whole(
        "Error: Error Domain=.*\\}|corvel: .*junk[0-9]+\\.png: cannot be read: .*");
    std::istringstream lines(run.output);
    int count = 0, messages = 0;
    for (std::string line; std::getline(lines, line); ++count) {
      EXPECT_TRUE(std::regex_match(line, whole)) << line;
      messages += line.rfind("corvel: ", 0) == 0;
    }
    EXPECT_EQ(messages, 200) << verbose;
    if (verbose.empty()) {
      EXPECT_EQ(count, 200);
    }
  }
}

}  // namespace
}  // namespace corvel
