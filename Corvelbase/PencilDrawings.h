// Pencil drawings in attributed text: the category PencilDrawings of AttributedString
// (declared in Corvelbase/platform/AttributedString.h under that name), its pasteboard
// type and its two process-wide dictionaries.
//
// In the text a drawing is an RVMXScaledImageAttachment showing its picture, whose
// pencilAttachment is the RVPencilAttachment with the strokes. On the pasteboard it is an
// extra representation of type RVPencilPasteboardData, a keyed archive of
// { identifier: stroke data }. In a saved RTFD bundle it is the file "<uuid>.pencildata",
// appended as an attachment at the end of the text, beside the picture "<uuid>.jpeg".
// The library hooks nothing itself: the host calls it around its own operations.
//
// The life of a drawing, and what the host does:
//
//   Insert  text.insertImage(picture, strokes, selection). Both files are written to the
//           caches directory; both attachments have `saving` 0, so the drawing offers no
//           file while the text is edited.
//   Copy    text.preCutOrCopy(selection); write the selection to the pasteboard as the
//   / cut   text system does (RTFDFromRange under "com.apple.flat-rtfd": the pictures now
//           give their "<uuid>.jpeg" files); for a cut, delete the selection; then
//           text.postCutOrCopy(selection), which adds the drawings' item beside the
//           others and puts `saving` back to 0. Pair the two calls on one thread with no
//           other pair between them.
//   Paste   Insert the pasteboard's text (the pictures come back as plain attachments
//           named "<uuid>.jpeg"), then text.checkForPencilDataOnPaste() and match
//           pastedPencilDataDictionary's keys with fileIDForAttachment of the pictures.
//   Save    Put `saving` 1 on the pictures and their drawings (else they are written under
//           generic names and cannot be matched again), call
//           text.preSaveRTFD(&range, drawings) with { identifier: drawing attachment } for
//           every drawing of the text (those kept from loading and the pencilAttachment of
//           pictures inserted since), write the bundle (writeRTFDToPath), call
//           text.postSaveRTFD(range), and put `saving` back to 0.
//   Load    Read the bundle (attributedStringWithContentsOfRTFD), call
//           text.removePencilAttachments() and keep its { identifier: attachment }: each
//           is a plain attachment whose wrapper holds the stroke bytes, to be given back
//           at the next save; then text.postLoadDocument().
//
// The attachment characters of the appended drawings stay in the text as plain U+FFFC
// after postSaveRTFD and removePencilAttachments: the text keeps its length.
#pragma once

#include <optional>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/RVMXScaledImageAttachment.h"
#include "Corvelbase/RVPencilAttachment.h"
#include "Corvelbase/platform/AttributedString.h"

namespace corvel {

// The pasteboard type of the drawings' item: "com.corvelwrks.pencildata". The domain word
// is spelled with one letter fewer than elsewhere in the library; other programs already
// read and write this exact string, so it must stay as it is.
CORVEL_EXPORT extern const std::string RVPencilPasteboardData;

// The log line of a failed archive; the reason follows it.
CORVEL_EXPORT extern const std::string RVPencilClipboardFailurePrefix;
// "Failed to copy pencil data to clipboard: "

// The drawings of the cut or copy in progress: set by preCutOrCopy, used and cleared
// (nullopt) by postCutOrCopy.
CORVEL_EXPORT extern std::optional<PencilDataDictionary> pencilDataDict;
// The drawings last read from the pasteboard by checkForPencilDataOnPaste (nullopt when
// that item could not be read). The host reads it to re-attach pasted drawings; the
// library never does.
//
// Both are process-wide and unguarded: they assume one cut, copy or paste at a time, on
// the thread that edits the text.
CORVEL_EXPORT extern std::optional<PencilDataDictionary> pastedPencilDataDictionary;

}  // namespace corvel
