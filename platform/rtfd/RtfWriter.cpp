#include <cmath>
#include <cstdio>

#include "platform/rtfd/RtfCodec.h"

namespace corvel::detail {

namespace {

// Windows-1252 is the code page readers without Unicode fall back to; \uc1 gives them a
// '?' for each character outside it.
constexpr char kHeader[] =
    "{\\rtf1\\ansi\\ansicpg1252\\uc1\\deff0"
    "{\\fonttbl\\f0\\fswiss\\fcharset0 Helvetica;}\n"
    "\\pard\\f0\\fs24 ";
constexpr char kFooter[] = "}\n";
// The character the platform's text system puts after an attachment's graphic group.
constexpr char kPlaceholder[] = "\\'ac";
constexpr double kTwipsPerPoint = 20.0;

void putHexByte(std::string& out, unsigned byte) {
  char hex[5];
  std::snprintf(hex, sizeof hex, "\\'%02x", byte & 0xFF);
  out += hex;
}

void putUnit(std::string& out, char16_t c) {
  switch (c) {
    case u'\\':
      out += "\\\\";
      return;
    case u'{':
      out += "\\{";
      return;
    case u'}':
      out += "\\}";
      return;
    case u'\n':
      out += "\\par\n";
      return;
    case u'\t':
      out += "\\tab ";
      return;
    case u'\u2028':
      out += "\\line ";
      return;
    default:
      break;
  }
  if (c >= 0x20 && c < 0x7F) {
    out += static_cast<char>(c);
  } else if (c >= 0xA0 && c <= 0xFF) {
    putHexByte(out, c);  // the same byte in Windows-1252
  } else {
    // A signed 16-bit number, as RTF counts; surrogate halves go one by one.
    out += "\\u" + std::to_string(c >= 0x8000 ? static_cast<int>(c) - 0x10000 : c) + "?";
  }
}

// The name as UTF-8 inside the graphic group: RTF's specials escaped, control and 8-bit
// bytes as \'xx so the file stays 7-bit.
void putName(std::string& out, const std::string& name) {
  for (unsigned char byte : name) {
    if (byte == '\\' || byte == '{' || byte == '}') {
      out += '\\';
      out += static_cast<char>(byte);
    } else if (byte < 0x20 || byte >= 0x7F) {
      putHexByte(out, byte);
    } else {
      out += static_cast<char>(byte);
    }
  }
}

void putDimension(std::string& out, const char* word, double points) {
  double twips = std::round(points * kTwipsPerPoint);
  if (!(twips > 0 && twips < 2147483647.0)) return;
  out += word;
  out += std::to_string(static_cast<long>(twips));
}

void putAttachment(std::string& out, const AttachmentReference& reference) {
  out += "{{\\NeXTGraphic ";
  putName(out, reference.name);
  if (reference.size) {
    putDimension(out, " \\width", reference.size->width);
    putDimension(out, " \\height", reference.size->height);
  }
  out += "\n}";
  out += kPlaceholder;
  out += '}';
}

}  // namespace

std::string writeRTF(const AttributedString& text, Range range, const AttachmentNamer& namer) {
  std::string out = kHeader;
  const String& units = text.string();
  text.enumerateAttribute(
      AttachmentAttributeName, range, 0, [&](const AttributeValue* value, Range piece, bool*) {
        const auto* attachment =
            value ? std::get_if<std::shared_ptr<TextAttachment>>(value) : nullptr;
        for (std::uint64_t i = piece.location; i < piece.max(); ++i) {
          std::optional<AttachmentReference> reference;
          if (attachment && *attachment && units[i] == AttachmentCharacter)
            reference = namer(*attachment);
          if (reference)
            putAttachment(out, *reference);
          else
            putUnit(out, units[i]);
        }
      });
  out += kFooter;
  return out;
}

}  // namespace corvel::detail
