#include "Corvelbase/platform/String.h"

#include <unicode/ustring.h>

#include <limits>

namespace corvel {

namespace {

// ICU counts in 32-bit lengths; longer texts are converted in pieces of this size, cut
// where no character is split.
constexpr std::size_t kPiece = std::size_t{1} << 30;

void appendFromUTF8(String& out, std::string_view utf8) {
  UErrorCode status = U_ZERO_ERROR;
  int32_t needed = 0;
  // Every UTF-8 byte yields at most one UTF-16 unit.
  std::size_t start = out.size();
  out.resize(start + utf8.size());
  u_strFromUTF8WithSub(out.data() + start, static_cast<int32_t>(utf8.size()), &needed, utf8.data(),
                       static_cast<int32_t>(utf8.size()), 0xFFFD, nullptr, &status);
  out.resize(U_FAILURE(status) ? start : start + static_cast<std::size_t>(needed));
}

void appendToUTF8(std::string& out, std::u16string_view utf16) {
  UErrorCode status = U_ZERO_ERROR;
  int32_t needed = 0;
  // Every UTF-16 unit yields at most three UTF-8 bytes (a pair yields four for two).
  std::size_t start = out.size();
  std::size_t room = utf16.size() * 3;
  if (room > static_cast<std::size_t>(std::numeric_limits<int32_t>::max())) {
    room = static_cast<std::size_t>(std::numeric_limits<int32_t>::max());
  }
  out.resize(start + room);
  u_strToUTF8WithSub(out.data() + start, static_cast<int32_t>(room), &needed, utf16.data(),
                     static_cast<int32_t>(utf16.size()), 0xFFFD, nullptr, &status);
  out.resize(U_FAILURE(status) ? start : start + static_cast<std::size_t>(needed));
}

}  // namespace

String fromUTF8(std::string_view utf8) {
  String out;
  out.reserve(utf8.size());
  while (!utf8.empty()) {
    std::size_t cut = std::min(utf8.size(), kPiece);
    // Back up over continuation bytes so no sequence is split between pieces.
    for (int i = 0;
         i < 3 && cut < utf8.size() && (static_cast<unsigned char>(utf8[cut]) & 0xC0) == 0x80;
         ++i) {
      --cut;
    }
    appendFromUTF8(out, utf8.substr(0, cut));
    utf8.remove_prefix(cut);
  }
  return out;
}

std::string toUTF8(std::u16string_view utf16) {
  std::string out;
  out.reserve(utf16.size());
  while (!utf16.empty()) {
    std::size_t cut = std::min(utf16.size(), kPiece / 2);
    // Keep a surrogate pair together.
    if (cut < utf16.size() && utf16[cut - 1] >= 0xD800 && utf16[cut - 1] < 0xDC00) --cut;
    appendToUTF8(out, utf16.substr(0, cut));
    utf16.remove_prefix(cut);
  }
  return out;
}

}  // namespace corvel
