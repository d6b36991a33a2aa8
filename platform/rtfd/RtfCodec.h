// The RTF text of attributed strings with attachments: what TXT.rtf of a bundle holds.
//
// The writer puts out plain text (every character, exactly) and marks each attachment
// with the desktop text system's own construct:
//   {{\NeXTGraphic NAME \widthW \heightH
//   }\'ac}
// where NAME is the attachment's file in the bundle (UTF-8, RTF-escaped) and W, H its size
// in twips. The reader turns that construct back into one U+FFFC carrying the attachment
// that a resolver makes for NAME.
//
// What the reader accepts and ignores is listed in Corvelbase/platform/RTFD.h.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "Corvelbase/platform/AttributedString.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/TextAttachment.h"

namespace corvel::detail {

// An attachment as the RTF names it: its file name and, when given, its size in points.
struct AttachmentReference {
  std::string name;
  std::optional<Size> size;
};

// For the writer: the reference under which an attachment is written, or nullopt to
// write its character as a plain U+FFFC.
using AttachmentNamer =
    std::function<std::optional<AttachmentReference>(const std::shared_ptr<TextAttachment>&)>;
// For the reader: the attachment for a reference (never null).
using AttachmentResolver =
    std::function<std::shared_ptr<TextAttachment>(const AttachmentReference&)>;

// The RTF document of `range` of `text` (clamped).
std::string writeRTF(const AttributedString& text, Range range, const AttachmentNamer& namer);

// The attributed string of an RTF document; nullopt when the bytes do not start (after
// whitespace) with "{\rtf".
std::optional<AttributedString> readRTF(const std::uint8_t* bytes, std::size_t size,
                                        const AttachmentResolver& resolver);

}  // namespace corvel::detail
