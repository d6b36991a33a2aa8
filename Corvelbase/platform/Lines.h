// The line model that text-editing commands share.
//
// A line ends right after a line feed (U+000A) and nowhere else: a carriage return is an
// ordinary character that stays part of its line's text, so a CR LF file has lines that
// end in "\r\n" and a lone CR never ends a line. Every line keeps its terminator, so the
// lines laid end to end give the text back unchanged. The last line is the text after the
// last line feed, and only when that is non-empty: a text that ends with a line feed has
// no empty line after it, and the empty text has no lines at all.
//
// Pure functions of their arguments; safe to call from any thread. Unpaired surrogates
// are plain code units here and never split or change anything.
#pragma once

#include <string_view>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// The text split into its lines as described above, in order. Empty for the empty text.
// Example: u"a\r\nb\n\nc" -> {u"a\r\n", u"b\n", u"\n", u"c"}.
CORVEL_EXPORT std::vector<String> lines(std::u16string_view text);

// The last UTF-16 code unit of `text` (the low half of a trailing surrogate pair, say),
// or U+0000 for the empty text.
CORVEL_EXPORT char16_t lastCharacter(std::u16string_view text);

}  // namespace corvel
