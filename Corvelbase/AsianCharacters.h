// The `AsianCharacters` category: whether a text holds East-Asian (CJK) characters.
#pragma once

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel::AsianCharacters {

// True when some composed character sequence of `text` (an extended grapheme cluster)
// begins with a UTF-16 unit from U+2E80 to U+9FFF: CJK radicals, symbols and punctuation,
// Hiragana, Katakana, Bopomofo, Hangul compatibility Jamo, CJK extension A and the unified
// ideographs. Hangul syllables (U+AC00 on), halfwidth and fullwidth forms and characters
// outside the basic plane do not count, nor does a unit of the range that only extends a
// sequence begun by another character (a combining voiced mark after "a"). Unpaired
// surrogates are sequences of their own. Empty text gives false. Any thread.
CORVEL_EXPORT bool containsAsianCharacters(const String& text);

// The same answer found by walking every sequence; the reference the fast scan above is
// tested and measured against.
CORVEL_EXPORT bool containsAsianCharactersByWalking(const String& text);

}  // namespace corvel::AsianCharacters
