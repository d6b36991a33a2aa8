// The `Email` category: header values read out of the text of an e-mail message.
#pragma once

#include <optional>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel::Email {

// The value of the header `field` in `message`: the rest of the first line that starts
// with the field name (any case), a colon and exactly one white-space character. Folded
// continuation lines are not joined. nullopt when no line matches.
//
// CAVEAT: `field` is put into the regular expression "^(?:FIELD:)\s(.*)$" as it stands,
// so its regular-expression characters keep their meaning ("X-.*" matches any header
// starting with "X-"). A field that makes the pattern invalid, or that adds capture groups
// of its own, gives nullopt. A pattern whose matching runs away on a long message is cut
// off by a time limit and gives nullopt too, and so does a field longer than
// kMaxHeaderFieldLength, before any pattern is made of it.
CORVEL_EXPORT std::optional<String> headerValueForField(const String& message, const String& field);

// A header line holds at most 998 characters, so no field name is longer; a longer
// `field` is a pattern meant to make the regular expression engine work, not a name.
inline constexpr std::size_t kMaxHeaderFieldLength = 998;

// As above; with `extractEmailAddress`, a non-empty value is replaced by the first
// address-like run in it (no white space, "<", ",", ";", "." or "=" before the "@", up to
// the first ">" or white space after it), or nullopt when it holds none. A dotted local
// part therefore yields only what follows its last dot, and trailing punctuation such as
// a comma stays on the address.
CORVEL_EXPORT std::optional<String> headerValueForField(const String& message, const String& field,
                                                        bool extractEmailAddress);

}  // namespace corvel::Email
