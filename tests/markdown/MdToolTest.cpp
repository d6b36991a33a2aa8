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
  EXPECT_TRUE(writeFileAtomically(path, reinterpret_cast<const std::uint8_t*>(document.data()),
                                  document.size()));
  return testing::runCommand(std::string(CORVEL_TOOL_PATH) + " md " + args + " < '" + path +
                             "' 2>/dev/null");
}

TEST(MdTool, PrintsTheCommandsAnswerAsJSON) {
  struct Case {
    std::string document, args, output;
  } cases[] = {
      {"a\nb", "insertTaskList --selection 0,3",
       R"({"text":"- [ ] a\n- [ ] b","replacementRange":[0,3],"selectionRange":[0,15]})"},
      {"## T", "setMarkdownHeaderLevel --selection 0,0 --level 2",
       R"({"text":"","replacementRange":[0,3],"selectionRange":null})"},
      {"abc", "insertInlineCodeBlock --selection 1,1",
       R"({"text":"`b`","replacementRange":null,"selectionRange":null})"},
      // Ranges count UTF-16 units: the emoji is two.
      {"\xF0\x9F\x98\x80 a\nb", "insertQuote --selection 3,0",
       R"({"text":"> 😀 a\n","replacementRange":[0,5],"selectionRange":[5,0]})"},
      {"[a](u)", "lineContainsMarkdownLink --selection 1,0",
       R"({"result":true,"linkRange":[0,6],"textRange":[1,1]})"},
  };
  for (const Case& c : cases) {
    testing::CommandResult r = md(c.document, c.args);
    EXPECT_EQ(r.status, 0) << c.args;
    EXPECT_EQ(r.output, c.output + "\n") << c.args;
  }
}

TEST(MdTool, ApplyPrintsTheEditedDocument) {
  testing::CommandResult r = md("a\r\nb\r\n", "insertNumberedList --selection 0,6 --apply");
  EXPECT_EQ(r.status, 0);
  EXPECT_EQ(r.output, "1. a\r\n2. b\r\n");
  r = md("see this", "insertMarkdownLink --selection 4,4 --url http://x.org --apply");
  EXPECT_EQ(r.output, "see [this](http://x.org)");
}

TEST(MdTool, MisuseExitsWithStatusTwo) {
  const char* bad[] = {
      "insertTaskLists --selection 0,0",  // unknown command
      "insertTaskList",                   // no selection
      "insertTaskList --selection 0",     // malformed range
      "insertTaskList --selection 0,99",  // beyond the document
      "insertTaskList --selection 18446744073709551615,1",
      "insertTable --selection 0,0 --rows 1",      // missing --columns
      "insertTaskList --selection 0,0 --level 2",  // option of another command
      "lineContainsMarkdownLink --selection 0,0 --apply",
  };
  for (const char* args : bad) {
    testing::CommandResult r = md("abc", args);
    EXPECT_EQ(r.status, 2) << args;
    EXPECT_EQ(r.output, "") << args;
  }
}

}  // namespace
}  // namespace corvel
