#include <gtest/gtest.h>

#include "Corvelbase/MarkdownCommands.h"
#include "ReferenceLineModel.h"

namespace corvel {
namespace {

TEST(MarkdownLink, FindsTheLinkThatCoversTheSelection) {
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
      {"caret on the bracket", u"[a](u)", {0, 0}, true, {0, 6}, {1, 1}},
      {"no ( after ]", u"[a]x(u)", {1, 0}, false, NotFoundRange, kUnwritten},
      // The open index and close mark carry over: ")" after a rejected link closes again.
      {"stray ) after link", u"[a](u) x)", {7, 0}, true, {0, 9}, {1, 1}},
      {"later [ then stray )", u"[a](u) [x )", {9, 0}, true, {7, 4}, {1, 1}},
      // Only the first touched line is looked at; ranges are in the whole text.
      {"link on second line", u"x\n[a](u)", {3, 0}, true, {2, 6}, {3, 1}},
      {"link past first line", u"x\n[a](u)", {0, 5}, false, NotFoundRange, kUnwritten},
      {"caret past the end", u"[a](u)", {kMax, 0}, false, NotFoundRange, {1, 1}},
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
}

TEST(MarkdownLink, InsertWrapsTheSelectedText) {
  EXPECT_EQ(md::insertMarkdownLink(u"see this", u"http://x.org", {4, 4}), u"[this](http://x.org)");
  EXPECT_EQ(md::insertMarkdownLink(u"ab", u"u", {1, kMax}), u"[b](u)");
  EXPECT_EQ(md::insertMarkdownLink(u"ab", u"u", {kMax, kMax}), u"[](u)");
}

TEST(Header, PrefixHasLevelHashesAndASpace) {
  EXPECT_EQ(md::headerForLevel(u"", 0), u"");
  EXPECT_EQ(md::headerForLevel(u"", 1), u"# ");
  EXPECT_EQ(md::headerForLevel(u"", 7), u"####### ");
  // Absurd levels are capped instead of exhausting memory.
  const String capped = String(md::kMaxHeaderLevel, u'#') + u" ";
  EXPECT_EQ(md::headerForLevel(u"", md::kMaxHeaderLevel + 1), capped);
  EXPECT_EQ(md::headerForLevel(u"", kMax), capped);
}

struct HeaderCase {
  const char* what;
  String text;
  std::uint64_t level;
  Range selection;
  String expected;
  Range replacement;
  String after;  // the text once the editor applied the answer
};

template <std::size_t N, typename Command>
void expectHeaderEdits(const HeaderCase (&cases)[N], Command command) {
  for (const HeaderCase& c : cases) {
    Range replaced = kUnwritten;
    String out = command(c, &replaced);
    EXPECT_EQ(out, c.expected) << c.what;
    EXPECT_EQ(replaced, c.replacement) << c.what;
    EXPECT_EQ(testing::applyEdit(c.text, replaced, out), c.after) << c.what;
  }
}

TEST(Header, SetLevelReplacesOrTogglesTheFirstLinesHeader) {
  const String capped = String(md::kMaxHeaderLevel, u'#') + u" ";
  const HeaderCase cases[] = {
      {"same level removes", u"## Title", 2, {3, 0}, u"", {0, 3}, u"Title"},
      {"other level replaces", u"## Title", 3, {3, 0}, u"### ", {0, 3}, u"### Title"},
      {"plain line gets one", u"Title", 2, {0, 5}, u"## ", {0, 0}, u"## Title"},
      {"empty text", u"", 1, {0, 0}, u"# ", {0, 0}, u"# "},
      {"no space after #", u"#Title", 1, {0, 0}, u"", {0, 1}, u"Title"},
      {"level 0 removes", u"# x", 0, {0, 0}, u"", {0, 2}, u"x"},
      // Only six are counted; the seventh stays.
      {"seven, level 6", u"####### Seven", 6, {0, 0}, u"", {0, 6}, u"# Seven"},
      {"seven, level 2", u"####### Seven", 2, {0, 0}, u"## ", {0, 6}, u"## # Seven"},
      {"second line", u"a\n## b", 1, {4, 0}, u"# ", {2, 3}, u"a\n# b"},
      {"multi-line: first only", u"a\nb", 1, {0, 3}, u"# ", {0, 0}, u"# a\nb"},
      {"huge level", u"# x", kMax, {0, 0}, capped, {0, 2}, capped + u"x"},
  };
  expectHeaderEdits(cases, [](const HeaderCase& c, Range* r) {
    return md::setMarkdownHeaderLevel(c.text, c.level, c.selection, r);
  });
  EXPECT_EQ(md::setMarkdownHeaderLevel(u"x", 2, {0, 0}, nullptr), u"## ");
}

TEST(Header, IncrementRaisesAndWrapsAfterSix) {
  const HeaderCase cases[] = {
      {"plain line", u"Title", 0, {2, 0}, u"# ", {0, 0}, u"# Title"},
      {"empty text", u"", 0, {0, 0}, u"# ", {0, 0}, u"# "},
      {"level 5", u"##### T", 0, {0, 0}, u"#", {0, 0}, u"###### T"},
      {"level 6 wraps", u"###### Title", 0, {0, 0}, u"", {0, 7}, u"Title"},
      {"level 6, no space", u"######Title", 0, {0, 0}, u"", {0, 6}, u"Title"},
      {"seven lose six", u"####### T", 0, {0, 0}, u"", {0, 6}, u"# T"},
      {"second line", u"x\n###### y", 0, {9, 0}, u"", {2, 7}, u"x\ny"},
      {"caret past end", u"x\n", 0, {kMax, 0}, u"# ", {2, 0}, u"x\n# "},
  };
  expectHeaderEdits(cases, [](const HeaderCase& c, Range* r) {
    return md::incrementMarkdownHeader(c.text, c.selection, r);
  });
}

}  // namespace
}  // namespace corvel
