// Rich text with attachments (RTFD): reading and writing attributed strings as bundles.
//
// A bundle is a directory holding "TXT.rtf" and one file (or directory) per attachment at
// its top level, named in the RTF by the desktop text system's \NeXTGraphic construct, so
// bundles travel between this library and the platform's text editors. The flat form is
// the same bundle serialised into one buffer (FileWrapper::serializedRepresentation), for
// pasteboards.
//
// Writing: every character is kept exactly (all of Unicode, braces, backslashes, line
// breaks, tabs); text attributes other than attachments are not written. Each attachment
// character gives the file of the attachment's fileWrapper() as the attachment answers at
// that moment, named by the wrapper's preferredFilename, else its filename; without a
// wrapper, its contents() as "Attachment.<extension of fileType()>"; without contents, the
// JPEG of its image() as "Attachment.jpeg"; with none of these, a plain U+FFFC. Names are
// made safe (no '/', NUL or control characters, not "." or "..", not TXT.rtf) and unique
// (" 2", " 3"... before the extension); one wrapper object standing several times is
// written once. The size of an attachment (its bounds, else its image's size) is written
// as \width and \height.
//
// Reading: every attachment character comes back as a plain TextAttachment whose
// fileWrapper() holds the named file (filename and preferredFilename set to its name),
// with bounds from \width and \height. File names inside the RTF are untrusted: a name
// that is not one safe path component, or names a missing file, a symbolic link or a
// special file, gives an attachment without a file wrapper or contents; nothing outside
// the bundle is ever read. See platform/rtfd/RtfCodec.h for what the RTF reader accepts.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/AttributedString.h"
#include "Corvelbase/platform/FileWrapper.h"

namespace corvel {

// The name of the RTF text inside a bundle.
CORVEL_EXPORT extern const std::string RTFDTextFileName;  // "TXT.rtf"

// The bundle of `range` of `text` (clamped) as a directory wrapper. Never null.
CORVEL_EXPORT std::shared_ptr<FileWrapper> RTFDFileWrapperFromRange(const AttributedString& text,
                                                                    Range range);
// The flat form of the same bundle; empty only when an attachment's file is 4 GiB or more.
CORVEL_EXPORT Data RTFDFromRange(const AttributedString& text, Range range);
// Writes the bundle of the whole text to `path` (see FileWrapper::writeToPath: an existing
// bundle there is replaced only once the new one is complete). False on failure.
CORVEL_EXPORT bool writeRTFDToPath(const AttributedString& text, const std::string& path);

// The text of a bundle wrapper; nullopt when it is no directory or holds no regular
// TXT.rtf that starts as RTF.
CORVEL_EXPORT std::optional<AttributedString> attributedStringWithRTFDFileWrapper(
    const FileWrapper& bundle);
// The text of the flat form; nullopt when the bytes are not a serialised bundle.
CORVEL_EXPORT std::optional<AttributedString> attributedStringWithRTFD(const Data& flat);
// The text of the bundle directory at `path`, reading only TXT.rtf and the files it
// names; nullopt when `path` is no directory (or a symbolic link) or has no TXT.rtf.
CORVEL_EXPORT std::optional<AttributedString> attributedStringWithContentsOfRTFD(
    const std::string& path);
// The text of an RTF document alone: attachments come back without files. nullopt when
// the bytes do not start as RTF.
CORVEL_EXPORT std::optional<AttributedString> attributedStringWithRTF(const Data& rtf);

}  // namespace corvel
