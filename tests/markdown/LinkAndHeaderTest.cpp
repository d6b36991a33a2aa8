#include <gtest/gtest.h>

#include "Corvelbase/MarkdownCommands.h"
#include "ReferenceLineModel.h"

namespace corvel {
namespace {

TEST(MarkdownLink, FindsTheCoveringLinkAndWrapsTheSelection) {
  struct Case {
    const char* what;
    String text;
    Range selection;
    bool found;
    Range link;
    Range textRange;  // kUnwritten when no "](" was seen
  } cases[] = {
      {"caret in second link", u"[a](u) and [b](v)", {12, 0}, true, {11, 6}, {12, 1}},
      // Both links rejected; the text range of the last one stays written.
      {"caret between links", u"[a](u) and [b](v)", {8, 0}, false, NotFoundRange, {12, 1}},
      {"selection overlaps link", u"see [ab](u)", {0, 5}, true, {4, 7}, {5, 2}},
      {"caret just after link", u"[a](u)", {6, 0}, false, NotFoundRange, {1, 1}},
      {"no ( after ]", u"[a]x(u)", {1, 0}, false, NotFoundRange, kUnwritten},
      // The open index and close mark carry over: ")" after a rejected link closes again.
      {"stray ) after link", u"[a](u) x)", {7, 0}, true, {0, 9}, {1, 1}},
      {"later [ then stray )", u"[a](u) [x )", {9, 0}, true, {7, 4}, {1, 1}},
      // Only the first touched line is looked at; ranges are in the whole text.
      {"link on second line", u"x\n[a](u)", {3, 0}, true, {2, 6}, {3, 1}},
      {"link past first line", u"x\n[a](u)", {0, 5}, false, NotFoundRange, kUnwritten},
  };
  for (const auto& c : cases) {
    Range link{1, 1}, text = kUnwritten;
    EXPECT_EQ(md::lineContainsMarkdownLink(c.text, c.selection, &link, &text), c.found) << c.what;
    EXPECT_EQ(link, c.link) << c.what;
    EXPECT_EQ(text, c.textRange) << c.what;
  }
  // Without out pointers the answer is still given.
  EXPECT_TRUE(md::lineContainsMarkdownLink(u"[a](u)", {1, 0}, nullptr, nullptr));
  EXPECT_FALSE(md::lineContainsMarkdownLink(u"", {0, 0}, nullptr));
  // Inserting wraps the selected text.
  EXPECT_EQ(md::insertMarkdownLink(u"see this", u"http://x.org", {4, 4}), u"[this](http://x.org)");
  EXPECT_EQ(md::insertMarkdownLink(u"ab", u"u", {kMax, kMax}), u"[](u)");
}

// The header commands work on the first touched line only; ranges are in the whole text.
TEST(Header, SetOrRaiseTheFirstLinesHeader) {
  EXPECT_EQ(md::headerForLevel(u"", 0), u"");
  EXPECT_EQ(md::headerForLevel(u"", 7), u"####### ");
  // Absurd levels are capped instead of exhausting memory.
  const String capped = String(md::kMaxHeaderLevel, u'#') + u" ";
  EXPECT_EQ(md::headerForLevel(u"", md::kMaxHeaderLevel + 1), capped);
  constexpr std::uint64_t raise = 1234;  // not a level: the increment command
  const std::tuple<const char*, String, std::uint64_t, Range, String, Range> cases[] = {
      // Setting a level replaces the header, or removes it when the level is the same.
      {"same level removes", u"## Title", 2, {3, 0}, u"", {0, 3}},
      {"other level replaces", u"## Title", 3, {3, 0}, u"### ", {0, 3}},
      {"empty text", u"", 1, {0, 0}, u"# ", {0, 0}},
      {"no space after #", u"#Title", 1, {0, 0}, u"", {0, 1}},
      {"level 0 removes", u"# x", 0, {0, 0}, u"", {0, 2}},
      // Only six are counted; the seventh stays.
      {"seven, level 6", u"####### Seven", 6, {0, 0}, u"", {0, 6}},
      {"second line", u"a\n## b", 1, {4, 0}, u"# ", {2, 3}},
      {"multi-line: first only", u"a\nb", 1, {0, 3}, u"# ", {0, 0}},
      {"huge level", u"# x", kMax, {0, 0}, capped, {0, 2}},
      // Raising adds one, and wraps to none after six.
      {"plain line", u"Title", raise, {2, 0}, u"# ", {0, 0}},
      {"level 5", u"##### T", raise, {0, 0}, u"#", {0, 0}},
      {"level 6 wraps", u"###### Title", raise, {0, 0}, u"", {0, 7}},
      {"level 6, no space", u"######Title", raise, {0, 0}, u"", {0, 6}},
      {"caret past end", u"x\n", raise, {kMax, 0}, u"# ", {2, 0}},
  };
  for (const auto& [what, text, level, selection, expected, replacement] : cases) {
    Range replaced = kUnwritten;
    String out = level == raise ? md::incrementMarkdownHeader(text, selection, &replaced)
                                : md::setMarkdownHeaderLevel(text, level, selection, &replaced);
    EXPECT_EQ(out, expected) << what;
    EXPECT_EQ(replaced, replacement) << what;
  }
  EXPECT_EQ(md::setMarkdownHeaderLevel(u"x", 2, {0, 0}, nullptr), u"## ");
}

}  // namespace
}  // namespace corvel
