// Strings, ranges and raw data as the library's API uses them.
//
// A `String` is UTF-16 code units, and every `Range` indexes those units, so locations
// and lengths mean the same here as in an editor that counts UTF-16. Conversions to and
// from UTF-8 never fail: invalid input is replaced by U+FFFD.
#pragma once

#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <vector>

#include "Corvelbase/Export.h"

namespace corvel {

using String = std::u16string;
using Data = std::vector<std::uint8_t>;

// The "not found" location: the largest signed 64-bit integer.
inline constexpr std::uint64_t NotFound =
    static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());

struct Range {
  std::uint64_t location = 0;
  std::uint64_t length = 0;

  // location + length, wrapping like the unsigned arithmetic it mirrors.
  constexpr std::uint64_t max() const { return location + length; }
  friend constexpr bool operator==(const Range&, const Range&) = default;
};

inline constexpr Range NotFoundRange{NotFound, 0};

// UTF-8 <-> UTF-16. Unpaired surrogates and malformed UTF-8 become U+FFFD.
CORVEL_EXPORT String fromUTF8(std::string_view utf8);
CORVEL_EXPORT std::string toUTF8(std::u16string_view utf16);

// Convenience for literals and tests: `u"..."` is already a String; this is for
// std::string sources.
inline String S(std::string_view utf8) { return fromUTF8(utf8); }

}  // namespace corvel
