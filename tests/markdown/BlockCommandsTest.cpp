#include <gtest/gtest.h>

#include <limits>

#include "Corvelbase/MarkdownCommands.h"
#include "ReferenceLineModel.h"

namespace corvel {
namespace {

TEST(InlineCode, WrapsTheSelectionInBackticks) {
  EXPECT_EQ(md::insertInlineCodeBlock(u"abc", {1, 1}), u"`b`");
  EXPECT_EQ(md::insertInlineCodeBlock(u"abc", {0, kMax}), u"`abc`");
  EXPECT_EQ(md::insertInlineCodeBlock(u"abc", {5, 2}), u"``");
  // A selection that splits a surrogate pair is taken as given.
  EXPECT_EQ(md::insertInlineCodeBlock(u"\U0001F600x", {1, 1}), u"`\xDE00`");
}

// One row of the block commands: `a` and `b` are the command's own numbers (table rows and
// columns, or the alignment), unused by the code fence.
struct BlockCase {
  const char* what;
  String text;
  Range selection;
  String expected;
  Range replacement;
  std::int64_t a = 0, b = 0;
};

template <typename Command>
void expectBlocks(std::initializer_list<BlockCase> cases, Command command) {
  for (const BlockCase& c : cases) {
    Range replaced = kUnwritten;
    EXPECT_EQ(command(c, &replaced), c.expected) << c.what;
    EXPECT_EQ(replaced, c.replacement) << c.what;
  }
}

TEST(CodeBlock, FencesTheSelectionOnLinesOfItsOwn) {
  expectBlocks(
      {
          {"caret at line start", u"abc\n", {0, 0}, u"```\n\n```\n", {0, 0}},
          {"mid-line selection", u"abc", {1, 1}, u"\n```\nb\n```\n", {1, 1}},
          {"CR LF lines", u"a\r\nb", {0, 4}, u"```\na\r\nb\n```\n", {0, 4}},
          {"past the end", u"ab", {kMax, 1}, u"\n```\n\n```\n", {2, 0}},
      },
      [](const BlockCase& c, Range* r) { return md::insertCodeBlock(c.text, c.selection, r); });
}

TEST(Table, HeaderThenAlignmentThenBodyAfterTheLastLine) {
  expectBlocks(
      {
          // After the last touched line.
          {"2x2", u"a\nb\nc", {0, 3}, u"\n|   |   |\n|:--|:--|\n|   |   |\n", {4, 0}, 2, 2},
          {"rows 0: header only", u"a\n", {0, 0}, u"\n|   |   |\n", {2, 0}, 0, 2},
          {"columns 0", u"a\n", {0, 0}, u"\n|\n|\n|\n", {2, 0}, 2, 0},
          {"empty document", u"", {0, 0}, u"\n|   |\n|:--|\n", {0, 0}, 1, 1},
      },
      [](const BlockCase& c, Range* r) {
        return md::insertTable(c.text, c.selection, c.a, c.b, r);
      });
  // Absurd sizes are capped instead of exhausting memory.
  const std::uint64_t n = md::kMaxTableDimension;
  String table = md::insertTable(u"a", {0, 0}, kMax, kMax);
  ASSERT_EQ(table.size(), 1 + (n + 1) * (4 * n + 2));
  EXPECT_EQ(table.substr(1 + 4 * n + 2, 8), u"|:--|:--");
  EXPECT_EQ(md::insertTable(u"a", {0, 0}, kMax, 1), md::insertTable(u"a", {0, 0}, n, 1));
}

TEST(Alignment, WrapsTheTouchedLinesInADiv) {
  for (std::int64_t other : {std::int64_t{0}, std::numeric_limits<std::int64_t>::min()})
    EXPECT_EQ(md::justifyString(u"", other), u"<div align=\"left\">\n") << other;
  expectBlocks(
      {
          // The closing tag follows the last line's text directly.
          {"no final feed", u"a\nb", {0, 3}, u"<div align=\"center\">\na\nb</div>\n", {0, 3}, 1},
          {"final feed", u"a\nb\n", {0, 4}, u"<div align=\"right\">\na\nb\n</div>\n", {0, 4}, 2},
          {"one of three lines", u"a\nb\nc", {2, 0}, u"<div align=\"left\">\nb\n</div>\n", {2, 2}},
      },
      [](const BlockCase& c, Range* r) {
        return md::insertHTMLJustity(c.text, c.a, c.selection, r);
      });
}

}  // namespace
}  // namespace corvel
