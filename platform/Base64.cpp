#include "Corvelbase/platform/Base64.h"

namespace corvel {

namespace {

constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

int valueOf(char c) {
  if (c >= 'A' && c <= 'Z') return c - 'A';
  if (c >= 'a' && c <= 'z') return c - 'a' + 26;
  if (c >= '0' && c <= '9') return c - '0' + 52;
  if (c == '+') return 62;
  if (c == '/') return 63;
  return -1;
}

}  // namespace

std::string base64Encoding(const Data& bytes, std::uint32_t options) {
  std::string plain;
  plain.reserve((bytes.size() + 2) / 3 * 4);
  std::size_t i = 0;
  for (; i + 3 <= bytes.size(); i += 3) {
    std::uint32_t v = bytes[i] << 16 | bytes[i + 1] << 8 | bytes[i + 2];
    for (int shift = 18; shift >= 0; shift -= 6) plain += kAlphabet[(v >> shift) & 63];
  }
  if (std::size_t rest = bytes.size() - i) {
    std::uint32_t v = bytes[i] << 16 | (rest == 2 ? bytes[i + 1] << 8 : 0);
    plain += kAlphabet[(v >> 18) & 63];
    plain += kAlphabet[(v >> 12) & 63];
    plain += rest == 2 ? kAlphabet[(v >> 6) & 63] : '=';
    plain += '=';
  }
  std::size_t lineLength = (options & Base64Encoding64CharacterLineLength)   ? 64
                           : (options & Base64Encoding76CharacterLineLength) ? 76
                                                                             : 0;
  if (lineLength == 0 || plain.size() <= lineLength) return plain;
  std::string lineEnd;
  if (options & Base64EncodingEndLineWithCarriageReturn) lineEnd += '\r';
  if (options & Base64EncodingEndLineWithLineFeed) lineEnd += '\n';
  if (lineEnd.empty()) lineEnd = "\r\n";
  std::string lined;
  lined.reserve(plain.size() + plain.size() / lineLength * lineEnd.size());
  for (std::size_t at = 0; at < plain.size(); at += lineLength) {
    if (at) lined += lineEnd;
    lined.append(plain, at, lineLength);
  }
  return lined;
}

std::optional<Data> base64Decoding(std::string_view text) {
  if (text.size() > kMaxBase64TextLength) return std::nullopt;
  Data out;
  out.reserve(text.size() / 4 * 3);
  std::uint32_t acc = 0;
  int bits = 0, symbols = 0, padding = 0;
  for (char c : text) {
    if (c == '\r' || c == '\n' || c == ' ' || c == '\t') continue;
    if (c == '=') {
      ++padding;
      ++symbols;
      continue;
    }
    int v = valueOf(c);
    if (v < 0 || padding) return std::nullopt;  // a stray character, or data after '='
    ++symbols;
    acc = (acc << 6 | static_cast<std::uint32_t>(v)) & 0xFFFFFF;
    bits += 6;
    if (bits >= 8) {
      bits -= 8;
      out.push_back(static_cast<std::uint8_t>(acc >> bits));
    }
  }
  if (symbols % 4 != 0 || padding > 2) return std::nullopt;
  return out;
}

Data encodedBase64Data(const Data& bytes) {
  std::string text = base64Encoding(bytes, Base64Encoding64CharacterLineLength);
  return Data(text.begin(), text.end());
}

}  // namespace corvel
