#include <gtest/gtest.h>

#include "Corvelbase/MarkdownCommands.h"
#include "ReferenceLineModel.h"

namespace corvel {
namespace {

using Command = String (*)(const String&, Range, Range*, Range*);

String bullets(const String& text, Range range, Range* replaced, Range* selected) {
  return md::insertAtStartOfLine(text, u"- ", range, false, replaced, selected);
}

struct EditCase {
  const char* what;
  String text;
  Range selection;
  String expected;
  Range replacement;
  Range selected;
  Command command = bullets;
};

template <std::size_t N>
void expectEdits(const EditCase (&cases)[N], Command command = nullptr) {
  for (const EditCase& c : cases) {
    Range replaced = kUnwritten, selected = kUnwritten;
    Command run = command ? command : c.command;
    EXPECT_EQ(run(c.text, c.selection, &replaced, &selected), c.expected) << c.what;
    EXPECT_EQ(replaced, c.replacement) << c.what;
    EXPECT_EQ(selected, c.selected) << c.what;
  }
}

TEST(LinePrefix, TogglesThePrefixAndCarriesTheSelection) {
  const EditCase cases[] = {
      {"mixed lines each toggle", u"- a\nb", {0, 5}, u"a\n- b", {0, 5}, {0, 5}},
      {"CR LF lines", u"a\r\nb\r\n", {0, 6}, u"- a\r\n- b\r\n", {0, 6}, {0, 10}},
      {"empty line gets it", u"a\n\nb", {2, 0}, u"- \n", {2, 1}, {4, 0}},
      {"shorter than prefix", u"-", {0, 1}, u"- -", {0, 1}, {0, 3}},
      {"unpaired surrogates", u"\xDC00\n\xD800", {0, 3}, u"- \xDC00\n- \xD800", {0, 3}, {0, 7}},
      // The selection arithmetic, in coordinates of the text after the edit.
      {"caret at line start moves behind", u"abc", {0, 0}, u"- abc", {0, 3}, {2, 0}},
      {"caret mid-line keeps distance to end", u"abc", {2, 0}, u"- abc", {0, 3}, {4, 0}},
      {"selection across lines", u"ab\ncd", {1, 3}, u"- ab\n- cd", {0, 5}, {3, 5}},
      {"end at a line end", u"ab\ncd\n", {0, 3}, u"- ab\n", {0, 3}, {0, 5}},
      // Removing: never before the line start, never a negative length.
      {"caret inside removed prefix", u"- abc", {1, 0}, u"abc", {0, 5}, {0, 0}},
      {"end inside removed prefix", u"- abc", {0, 1}, u"abc", {0, 5}, {0, 0}},
      {"caret after removed prefix", u"- abc", {4, 0}, u"abc", {0, 5}, {2, 0}},
      // Where no real line is touched the caret stays put in front of the prefix.
      {"empty document", u"", {0, 0}, u"- ", {0, 0}, {0, 0}},
      {"caret at very end", u"ab", {2, 0}, u"- ab", {0, 2}, {2, 0}},
      {"selection past the end", u"ab", {1, kMax}, u"- ab", {0, 2}, {3, 1}},
      // The header's caveat: removing before a caret at the very end leaves the caret
      // past the new end, for the host to clamp.
      {"caret past the new end", u"- a", {3, 0}, u"a", {0, 3}, {3, 0}, md::insertUnorderedList},
      // The named commands, with their own prefixes.
      {"task off", u"- [ ] a", {6, 0}, u"a", {0, 7}, {0, 0}, md::insertTaskList},
      {"half prefix", u"- [x] a", {0, 0}, u"- [ ] - [x] a", {0, 7}, {6, 0}, md::insertTaskList},
  };
  expectEdits(cases);
}

TEST(LinePrefix, FirstLineOnlyCommands) {
  Range replaced = kUnwritten;
  EXPECT_EQ(md::insertAtStartOfLine(u"a", u"", {0, 1}, false), u"a");  // empty prefix: no-op
  // The horizontal rule goes before the first line only.
  EXPECT_EQ(md::insertHorizontalLine(u"a\nb\nc", {0, 5}, &replaced), u"___\na\nb\nc");
  EXPECT_EQ(replaced, (Range{0, 5}));
  // A first line that is the rule itself goes away; the rest is copied.
  EXPECT_EQ(md::insertHorizontalLine(u"___\nx", {0, 5}, &replaced), u"x");
  EXPECT_EQ(replaced, (Range{0, 5}));
}

TEST(NumberedList, RecognisesTheNumberPrefixAsICUDoes) {
  struct Case {
    String line;
    bool found;
    Range match;
  } cases[] = {
      {u"  3.  y", true, {0, 6}},         {u"1.\n", true, {0, 3}},  // "\s" takes the line feed
      {u"\t\n1. a", true, {0, 5}},                                  // and leading line breaks
      {u"\u0661\u0662. a", true, {0, 4}},  // several Arabic-Indic digits are digits
      {u"1.x", false, kUnwritten},        {u"x 1. y", false, kUnwritten},
  };
  for (const Case& c : cases) {
    Range match = kUnwritten;
    EXPECT_EQ(md::containsNumberedList(c.line, &match), c.found) << toUTF8(c.line);
    EXPECT_EQ(match, c.match) << toUTF8(c.line);
  }
  EXPECT_TRUE(md::containsNumberedList(u"4. z", nullptr));
}

TEST(NumberedList, NumbersRenumbersOrRemoves) {
  const EditCase cases[] = {
      {"renumbers by place", u"x\n7. y", {0, 6}, u"1. x\n2. y", {0, 6}, {0, 9}},
      {"removing copies plain lines", u"1. a\nb", {0, 6}, u"a\nb", {0, 6}, {0, 3}},
      // A line that was only its number (the match took the feed) becomes "\n".
      {"number then feed", u"1.\nb", {0, 4}, u"\nb", {0, 4}, {0, 2}},
      {"number at text end", u"1. ", {0, 3}, u"\n", {0, 3}, {0, 1}},
      {"caret after removed number", u"12. x", {4, 0}, u"x", {0, 5}, {0, 0}},
      {"empty document", u"", {0, 0}, u"1. ", {0, 0}, {0, 0}},
      {"past the end", u"a\n", {kMax, 5}, u"1. ", {2, 0}, {2, 0}},
  };
  expectEdits(cases, md::insertNumberedList);
}

TEST(NumberedList, TwoApplicationsGiveTheTextBack) {
  const String text = u"alpha\n\nbeta\r\ngamma";
  Range replaced, selected;
  String once = md::insertNumberedList(text, {0, text.size()}, &replaced, &selected);
  String numbered = testing::applyEdit(text, replaced, once);
  EXPECT_EQ(numbered, u"1. alpha\n2. \n3. beta\r\n4. gamma");
  EXPECT_EQ(selected, (Range{0, numbered.size()}));
  String twice = md::insertNumberedList(numbered, selected, &replaced, &selected);
  EXPECT_EQ(testing::applyEdit(numbered, replaced, twice), u"alpha\n\nbeta\r\ngamma");
}

}  // namespace
}  // namespace corvel
