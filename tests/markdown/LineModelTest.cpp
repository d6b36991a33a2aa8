#include <gtest/gtest.h>

#include <random>

#include "Corvelbase/MarkdownCommands.h"
#include "Corvelbase/platform/Lines.h"
#include "ReferenceLineModel.h"

namespace corvel {
namespace {

using MarkdownCommands::LineItem;
using MarkdownCommands::linesForRange;

TEST(Lines, EndOnlyAfterLineFeedAndKeepTheirTerminators) {
  const std::pair<String, std::vector<String>> cases[] = {
      {u"", {}},
      {u"a\n", {u"a\n"}},  // no empty line after a final line feed
      {u"\n\n", {u"\n", u"\n"}},
      {u"a\r\nb\rc\n", {u"a\r\n", u"b\rc\n"}},        // CR stays in its line, never ends one
      {u"\xD800\n\xDC00", {u"\xD800\n", u"\xDC00"}},  // unpaired surrogates are plain units
  };
  for (const auto& [text, expected] : cases) EXPECT_EQ(lines(text), expected) << toUTF8(text);
  // The last character is the last code unit.
  EXPECT_EQ(lastCharacter(u"\U0001F600"), u'\xDE00');  // low half of the pair
}

// The quirks pinned by hand; the comparison with the model below covers the rest.
TEST(LinesForRange, TakesTheLinesASelectionTouches) {
  const std::tuple<const char*, String, Range, std::vector<LineItem>> cases[] = {
      // The empty-line item: nothing real to take.
      {"empty text", u"", {0, 0}, {{u"", {0, 0}}}},
      {"caret after final feed", u"abc\n", {4, 0}, {{u"", {4, 0}}}},
      {"caret at end, no final feed", u"abc", {3, 0}, {{u"abc", {0, 3}}}},
      {"ends at a line start", u"a\nb\nc", {0, 2}, {{u"a\n", {0, 2}}}},
      {"not-found location", u"ab", NotFoundRange, {{u"ab", {0, 2}}}},
  };
  for (const auto& [what, text, selection, expected] : cases)
    EXPECT_EQ(linesForRange(text, selection), expected) << what;
}

// The fast path looks only around the selection; it must agree with walking every line.
TEST(LinesForRange, AgreesWithTheStraightforwardModelOnRandomTexts) {
  std::mt19937_64 rng(20261122);
  const char16_t alphabet[] = {u'a', u'b', u'\n', u'\n', u'\r', u' ', u'#', u'\xD83D'};
  std::uniform_int_distribution<std::size_t> pick(0, std::size(alphabet) - 1);
  std::uniform_int_distribution<int> sizes(0, 40);
  for (int round = 0; round < 4000; ++round) {
    String text;
    for (int n = sizes(rng); n > 0; --n) text.push_back(alphabet[pick(rng)]);
    if (round % 3 == 0) text += u"\n";  // a good share of texts end with a line feed
    std::uniform_int_distribution<std::uint64_t> positions(0, text.size() + 2);
    for (int k = 0; k < 8; ++k) {
      Range selection{positions(rng), positions(rng)};
      if (k == 7) selection.length = kMax - (round % 5);  // overflowing lengths
      ASSERT_EQ(linesForRange(text, selection), testing::referenceLinesForRange(text, selection))
          << "text \"" << toUTF8(text) << "\" selection " << selection.location << ","
          << selection.length;
    }
  }
}

}  // namespace
}  // namespace corvel
