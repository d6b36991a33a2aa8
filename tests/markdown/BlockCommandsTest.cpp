#include <gtest/gtest.h>

#include <limits>

#include "Corvelbase/MarkdownCommands.h"
#include "ReferenceLineModel.h"

namespace corvel {
namespace {

namespace md = MarkdownCommands;
constexpr std::uint64_t kMax = std::numeric_limits<std::uint64_t>::max();
constexpr Range kUnwritten{12345, 6789};

TEST(InlineCode, WrapsTheSelectionInBackticks) {
  EXPECT_EQ(md::insertInlineCodeBlock(u"abc", {1, 1}), u"`b`");
  EXPECT_EQ(md::insertInlineCodeBlock(u"abc", {1, 0}), u"``");
  EXPECT_EQ(md::insertInlineCodeBlock(u"abc", {0, kMax}), u"`abc`");
  EXPECT_EQ(md::insertInlineCodeBlock(u"abc", {5, 2}), u"``");
  // A selection that splits a surrogate pair is taken as given.
  EXPECT_EQ(md::insertInlineCodeBlock(u"\U0001F600x", {1, 1}), u"`\xDE00`");
}

TEST(CodeBlock, FencesTheSelectionOnLinesOfItsOwn) {
  struct Case {
    const char* what;
    String text;
    Range selection;
    String expected;
    Range replacement;
  } cases[] = {
      {"caret at line start", u"abc\n", {0, 0}, u"```\n\n```\n", {0, 0}},
      {"empty document", u"", {0, 0}, u"```\n\n```\n", {0, 0}},
      {"whole line with feed", u"x\nabc\n", {2, 4}, u"```\nabc\n\n```\n", {2, 4}},
      {"mid-line selection", u"abc", {1, 1}, u"\n```\nb\n```\n", {1, 1}},
      {"CR LF lines", u"a\r\nb", {0, 4}, u"```\na\r\nb\n```\n", {0, 4}},
      {"past the end", u"ab", {kMax, 1}, u"\n```\n\n```\n", {2, 0}},
  };
  for (const auto& c : cases) {
    Range replaced = kUnwritten;
    std::optional<String> out = md::insertCodeBlock(c.text, c.selection, &replaced);
    ASSERT_TRUE(out.has_value()) << c.what;
    EXPECT_EQ(*out, c.expected) << c.what;
    EXPECT_EQ(replaced, c.replacement) << c.what;
  }
}

TEST(Table, HeaderThenAlignmentThenBodyAfterTheLastLine) {
  struct Case {
    const char* what;
    String text;
    Range selection;
    std::uint64_t rows, columns;
    String expected;
    Range replacement;
  } cases[] = {
      {"1 x 2", u"a", {0, 0}, 1, 2, u"\n|   |   |\n|:--|:--|\n", {1, 0}},
      {"2 x 3 after two lines",
       u"a\nb\nc",
       {0, 3},
       2,
       3,
       u"\n|   |   |   |\n|:--|:--|:--|\n|   |   |   |\n",
       {4, 0}},
      {"rows 0: header only", u"a\n", {0, 0}, 0, 2, u"\n|   |   |\n", {2, 0}},
      {"columns 0", u"a\n", {0, 0}, 2, 0, u"\n|\n|\n|\n", {2, 0}},
      {"empty document", u"", {0, 0}, 1, 1, u"\n|   |\n|:--|\n", {0, 0}},
  };
  for (const auto& c : cases) {
    Range replaced = kUnwritten;
    EXPECT_EQ(md::insertTable(c.text, c.selection, c.rows, c.columns, &replaced), c.expected)
        << c.what;
    EXPECT_EQ(replaced, c.replacement) << c.what;
  }
}

TEST(Table, HugeSizesAreCapped) {
  const std::uint64_t n = md::kMaxTableDimension;
  String table = md::insertTable(u"a", {0, 0}, kMax, kMax);
  ASSERT_EQ(table.size(), 1 + (n + 1) * (4 * n + 2));
  EXPECT_EQ(table.substr(1 + 4 * n + 2, 8), u"|:--|:--");
  EXPECT_EQ(md::insertTable(u"a", {0, 0}, kMax, 1), md::insertTable(u"a", {0, 0}, n, 1));
}

TEST(Alignment, OpeningTagByValue) {
  EXPECT_EQ(md::justifyString(u"", 1), u"<div align=\"center\">\n");
  EXPECT_EQ(md::justifyString(u"", 2), u"<div align=\"right\">\n");
  for (std::int64_t other :
       {std::int64_t{0}, std::int64_t{3}, std::int64_t{5}, std::int64_t{-1},
        std::numeric_limits<std::int64_t>::min(), std::numeric_limits<std::int64_t>::max()}) {
    EXPECT_EQ(md::justifyString(u"", other), u"<div align=\"left\">\n") << other;
  }
}

TEST(Alignment, WrapsTheTouchedLinesInADiv) {
  struct Case {
    const char* what;
    String text;
    std::int64_t alignment;
    Range selection;
    String expected;
    Range replacement;
  } cases[] = {
      // The closing tag follows the last line's text directly.
      {"no final feed", u"a\nb", 1, {0, 3}, u"<div align=\"center\">\na\nb</div>\n", {0, 3}},
      {"final feed", u"a\nb\n", 2, {0, 4}, u"<div align=\"right\">\na\nb\n</div>\n", {0, 4}},
      {"one of three lines", u"a\nb\nc", 0, {2, 0}, u"<div align=\"left\">\nb\n</div>\n", {2, 2}},
      {"empty document", u"", 1, {0, 0}, u"<div align=\"center\">\n</div>\n", {0, 0}},
      {"caret after feed", u"a\n", 2, {2, 0}, u"<div align=\"right\">\n</div>\n", {2, 0}},
  };
  for (const auto& c : cases) {
    Range replaced = kUnwritten;
    EXPECT_EQ(md::insertHTMLJustity(c.text, c.alignment, c.selection, &replaced), c.expected)
        << c.what;
    EXPECT_EQ(replaced, c.replacement) << c.what;
  }
}

}  // namespace
}  // namespace corvel
