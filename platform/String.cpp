#include "Corvelbase/platform/String.h"

#include <unicode/ustring.h>

namespace corvel {

String fromUTF8(std::string_view utf8) {
  if (utf8.empty()) return {};
  UErrorCode status = U_ZERO_ERROR;
  int32_t needed = 0;
  // Every UTF-8 byte yields at most one UTF-16 unit.
  String out(utf8.size(), u'\0');
  u_strFromUTF8WithSub(out.data(), static_cast<int32_t>(out.size()), &needed, utf8.data(),
                       static_cast<int32_t>(utf8.size()), 0xFFFD, nullptr, &status);
  if (U_FAILURE(status)) return {};
  out.resize(static_cast<std::size_t>(needed));
  return out;
}

std::string toUTF8(std::u16string_view utf16) {
  if (utf16.empty()) return {};
  UErrorCode status = U_ZERO_ERROR;
  int32_t needed = 0;
  // Every UTF-16 unit yields at most three UTF-8 bytes (a pair yields four for two).
  std::string out(utf16.size() * 3, '\0');
  u_strToUTF8WithSub(out.data(), static_cast<int32_t>(out.size()), &needed, utf16.data(),
                     static_cast<int32_t>(utf16.size()), 0xFFFD, nullptr, &status);
  if (U_FAILURE(status)) return {};
  out.resize(static_cast<std::size_t>(needed));
  return out;
}

}  // namespace corvel
