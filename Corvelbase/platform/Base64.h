// Base64 as the desktop platform writes it, and the host operation `encodedBase64Data`.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// Line options of base64Encoding. Without a length option the text is one line. A length
// given without a line-ending option ends lines with CR LF; there is never a line end
// after the last line.
enum Base64EncodingOptions : std::uint32_t {
  Base64Encoding64CharacterLineLength = 1u << 0,
  Base64Encoding76CharacterLineLength = 1u << 1,
  Base64EncodingEndLineWithCarriageReturn = 1u << 4,
  Base64EncodingEndLineWithLineFeed = 1u << 5,
};

// The base64 text of `bytes` (padded with '='), broken into lines as `options` say.
CORVEL_EXPORT std::string base64Encoding(const Data& bytes, std::uint32_t options = 0);

// Longer base64 text than this (about 96 MiB of data) is refused unread.
inline constexpr std::size_t kMaxBase64TextLength = std::size_t{128} << 20;

// The bytes of base64 text. Line ends and other whitespace are skipped; any other
// character outside the alphabet, a wrong length or padding, or text longer than
// kMaxBase64TextLength gives nullopt.
CORVEL_EXPORT std::optional<Data> base64Decoding(std::string_view text);

// The host's operation on data objects: base64 in lines of 64 characters ended by CR LF,
// as data (ASCII bytes). 48 bytes give exactly 64 characters; 49 give 64, CR LF, "AA==".
CORVEL_EXPORT Data encodedBase64Data(const Data& bytes);

}  // namespace corvel
