#include <gtest/gtest.h>

#include <random>

#include "Corvelbase/AsianCharacters.h"

namespace corvel {
namespace {

using AsianCharacters::containsAsianCharacters;
using AsianCharacters::containsAsianCharactersByWalking;

TEST(AsianCharacters, CountsSequencesThatStartInTheRange) {
  const std::pair<std::u16string, bool> cases[] = {
      // Nothing, or Hangul syllables only.
      {u"", false},
      {u"한국어 문장입니다", false},
      // The range's edges: its first and last units are in, their neighbours are not.
      {u"\u2E80", true},
      {u"\u2E7F", false},
      {u"\u9FFF", true},
      {u"\uA000", false},
      {u"\u304B\u3099", true},  // kana with a voiced mark
      // A pair (extension B) starts with a surrogate; an unpaired one stands alone.
      {u"\U00020000", false},
      {u"\xDC00\u4E00", true},
      // A combining mark of the range only extends a sequence begun elsewhere; alone it
      // begins one.
      {u"a\u3099", false},
      {u"\u3099", true},
      // A prepended mark pulls the ideograph into its sequence.
      {u"\u0600\u4E00", false},
      {u"\u0600\u4E00\u4E00", true},
  };
  for (const auto& [text, expected] : cases) {
    EXPECT_EQ(containsAsianCharacters(text), expected) << toUTF8(text);
    EXPECT_EQ(containsAsianCharactersByWalking(text), expected) << toUTF8(text);
  }
}

// The fast scan must answer exactly as the walk over every sequence, on strings built
// from the characters where the two could part: marks, joiners, prepends, surrogates,
// Hangul jamo and syllables, kana with voiced marks, and the range's edges.
TEST(AsianCharacters, FastScanAgreesWithTheWalkOnRandomStrings) {
  const char16_t alphabet[] = {
      u'a',      u' ',      u'\r',     u'\n',     u'\u0301', u'\u200D', u'\u0600',
      u'\u0E33', u'\u1100', u'\u1161', u'\u11A8', u'\uAC00', u'\uD55C', u'\u3131',
      u'\u304B', u'\u3099', u'\u309A', u'\u302A', u'\u302F', u'\u30AB', u'\u4E00',
      u'\u2E80', u'\u2E7F', u'\u9FFF', u'\uA000', u'\uFF71', u'\uFE0F', u'\xD83D',
      u'\xDE00', u'\xD840', u'\xDC00', u'\u0915', u'\u094D', u'\u0937',
  };
  std::mt19937 rng(20240611);
  std::uniform_int_distribution<std::size_t> pick(0, std::size(alphabet) - 1);
  std::uniform_int_distribution<std::size_t> length(0, 12);
  int positives = 0;
  for (int i = 0; i < 20000; ++i) {
    std::u16string text;
    for (std::size_t n = length(rng); n > 0; --n) text += alphabet[pick(rng)];
    bool walked = containsAsianCharactersByWalking(text);
    ASSERT_EQ(containsAsianCharacters(text), walked) << toUTF8(text);
    positives += walked ? 1 : 0;
  }
  // Both answers occur often, so agreement means something.
  EXPECT_TRUE(positives > 2000 && positives < 18000) << positives;
}

}  // namespace
}  // namespace corvel
