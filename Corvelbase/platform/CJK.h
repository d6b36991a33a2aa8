// Detection of Chinese, Japanese and Korean characters, as block assembly needs it to
// split words and to recognise vertical text.
#pragma once

#include <cstdint>
#include <string_view>

#include "Corvelbase/Export.h"

namespace corvel {

// True for a code point of the Chinese, Japanese or Korean scripts:
//   U+1100-11FF Hangul Jamo             U+2E80-2FDF CJK and Kangxi radicals
//   U+2FF0-2FFF ideographic description U+3001-303F CJK symbols and punctuation
//                                       (U+3000, the ideographic space, is whitespace)
//   U+3040-30FF Hiragana, Katakana      U+3100-312F Bopomofo
//   U+3130-318F Hangul compatibility Jamo  U+3190-31FF kanbun, Bopomofo ext., strokes,
//                                       Katakana phonetic extensions
//   U+3200-33FF enclosed CJK, CJK compatibility   U+3400-4DBF CJK extension A
//   U+4E00-9FFF CJK unified ideographs  U+A960-A97F, U+D7B0-D7FF Hangul Jamo ext.
//   U+AC00-D7AF Hangul syllables        U+F900-FAFF CJK compatibility ideographs
//   U+FE30-FE4F CJK compatibility forms U+FF61-FFDC halfwidth Katakana and Hangul
//   U+1B000-1B16F Kana supplement/ext.  U+20000-3FFFF supplementary ideographs
// Latin fullwidth forms (U+FF01-FF60) are not counted: they are Latin text.
CORVEL_EXPORT bool isCJKCodePoint(char32_t c);

// True when the UTF-16 text holds at least one such character. Surrogate pairs are
// decoded (so an extension-B ideograph counts); a lone surrogate never counts.
CORVEL_EXPORT bool containsCJKCharacter(std::u16string_view text);

}  // namespace corvel
