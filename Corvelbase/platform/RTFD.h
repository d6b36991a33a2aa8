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
// the bundle is ever read.
//
// What the RTF reader accepts: groups; \uN with \ucN fallbacks (negative N, and surrogate
// halves that pair up); \'xx in the document's code page (\ansicpgN, \ansi, \mac, \pc,
// \pca, decoded with ICU; Windows-1252 when unknown); raw 8-bit text in that code page;
// \par, \sect, \row (line feed), \line (U+2028), \tab and \cell (tab), \page (form feed),
// the symbols \~ \_ \- \\ \{ \} and \emdash, \endash, \lquote, \rquote, \ldblquote,
// \rdblquote, \bullet, \enspace, \emspace, \qmspace, \zwj, \zwnj, \ltrmark, \rtlmark;
// \bin N (its bytes skipped); \NeXTGraphic with \width and \height.
// What it ignores: every other control word (fonts, sizes, colours, paragraph and
// character formatting, document settings), per-font \fcharset code pages, the
// destinations \fonttbl, \colortbl, \stylesheet, \info, \pict, \object, headers,
// footers, footnotes, \fldinst, list tables, \listtext and every {\* ...} group.
// Hostile input: any byte string gives an answer in time linear in its size; control
// words and numbers of any length are skipped, a document whose groups nest deeper than
// kMaxRTFGroupDepth (the document's own group counts) is refused (nullopt) as soon as
// the reader gets there, text after the group that closes the document is ignored, and
// a truncated document yields what was read (an unfinished \NeXTGraphic is dropped).
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/AttributedString.h"
#include "Corvelbase/platform/FileWrapper.h"

namespace corvel {

inline constexpr std::size_t kMaxRTFGroupDepth = 4096;

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
// names; nullopt when `path` is no directory (a link to one will do) or has no regular
// TXT.rtf.
CORVEL_EXPORT std::optional<AttributedString> attributedStringWithContentsOfRTFD(
    const std::string& path);
// The text of an RTF document alone: attachments come back without files. nullopt when
// the bytes do not start as RTF or nest too deep (see above); the readers above answer
// the same for such a TXT.rtf.
CORVEL_EXPORT std::optional<AttributedString> attributedStringWithRTF(const Data& rtf);

}  // namespace corvel
