// corvel md, as an editor in another language would drive it.
#include <gtest/gtest.h>

#include "Corvelbase/platform/Files.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

// Runs corvel md with `document` on standard input.
testing::CommandResult md(const std::string& document, const std::string& args) {
  testing::TempDir dir;
  std::string path = dir.file("doc.md");
  EXPECT_TRUE(writeFileAtomically(path, Data(document.begin(), document.end())));
  return testing::corvel("md " + args + " < '" + path + "' 2>/dev/null");
}

TEST(MdTool, PrintsTheAnswerAsJSONOrTheEditedDocument) {
  auto line = [](const std::string& json) { return json + "\n"; };
  struct Case {
    std::string document, args, output;
    int status = 0;
  } cases[] = {
      {"a\nb", "insertTaskList --selection 0,3",
       line(R"({"text":"- [ ] a\n- [ ] b","replacementRange":[0,3],"selectionRange":[0,15]})")},
      {"abc", "insertInlineCodeBlock --selection 1,1",
       line(R"({"text":"`b`","replacementRange":null,"selectionRange":null})")},
      // Ranges count UTF-16 units: the emoji is two.
      {"\xF0\x9F\x98\x80 a\nb", "insertQuote --selection 3,0",
       line(R"({"text":"> 😀 a\n","replacementRange":[0,5],"selectionRange":[5,0]})")},
      {"[a](u)", "lineContainsMarkdownLink --selection 1,0",
       line(R"({"result":true,"linkRange":[0,6],"textRange":[1,1]})")},
      // --apply prints the document with the edit made, line endings and all.
      {"a\r\nb\r\n", "insertNumberedList --selection 0,6 --apply", "1. a\r\n2. b\r\n"},
      {"## T", "setMarkdownHeaderLevel --selection 0,0 --level 3 --apply", "### T"},
      {"see this", "insertMarkdownLink --selection 4,4 --url http://x.org --apply",
       "see [this](http://x.org)"},
      // Misuse: status 2 and nothing printed.
      {"abc", "insertTaskLists --selection 0,0", "", 2},  // unknown command
      {"abc", "insertTaskList --selection 0", "", 2},     // malformed range
      {"abc", "insertTaskList --selection 18446744073709551615,1", "", 2},
      {"abc", "insertTable --selection 0,0 --rows 1", "", 2},      // missing --columns
      {"abc", "insertTaskList --selection 0,0 --level 2", "", 2},  // option of another command
      {"abc", "lineContainsMarkdownLink --selection 0,0 --apply", "", 2},
  };
  for (const Case& c : cases) {
    testing::CommandResult r = md(c.document, c.args);
    EXPECT_EQ(r.status, c.status) << c.args;
    EXPECT_EQ(r.output, c.output) << c.args;
  }
}

}  // namespace
}  // namespace corvel
