// Pencil drawings in attributed text: the category PencilDrawings on AttributedString, as
// functions taking the text first (namespace PencilDrawings), its pasteboard type and its
// two process-wide dictionaries.
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
//   Insert  insertImage(text, picture, strokes, selection). Both files are written to the
//           caches directory; both attachments have `saving` 0, so the drawing offers no
//           file while the text is edited.
//   Copy    preCutOrCopy(text, selection); write the selection to the pasteboard as the
//   / cut   text system does (RTFDFromRange under "com.apple.flat-rtfd": the pictures now
//           give their "<uuid>.jpeg" files); for a cut, delete the selection; then
//           postCutOrCopy(text, selection), which adds the drawings' item beside the
//           others and puts `saving` back to 0. Pair the two calls on one thread with no
//           other pair between them.
//   Paste   Insert the pasteboard's text (the pictures come back as plain attachments
//           named "<uuid>.jpeg"), then checkForPencilDataOnPaste(text) and match
//           pastedPencilDataDictionary's keys with fileIDForAttachment of the pictures.
//   Save    Put `saving` 1 on the pictures and their drawings (else they are written under
//           generic names and cannot be matched again), call
//           preSaveRTFD(text, &range, drawings) with { identifier: drawing attachment } for
//           every drawing of the text (those kept from loading and the pencilAttachment of
//           pictures inserted since), write the bundle (writeRTFDToPath), call
//           postSaveRTFD(text, range), and put `saving` back to 0.
//   Load    Read the bundle (attributedStringWithContentsOfRTFD), call
//           removePencilAttachments(text) and keep its { identifier: attachment }: each
//           is a plain attachment whose wrapper holds the stroke bytes, to be given back
//           at the next save; then postLoadDocument(text).
//
// The attachment characters of the appended drawings stay in the text as plain U+FFFC
// after postSaveRTFD and removePencilAttachments: the text keeps its length.
#pragma once

#include <map>
#include <optional>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/RVMXScaledImageAttachment.h"
#include "Corvelbase/RVPencilAttachment.h"
#include "Corvelbase/platform/AttributedString.h"

namespace corvel {

// Drawing identifier (UTF-8) to stroke data: what goes to the pasteboard.
using PencilDataDictionary = std::map<std::string, Data>;
// Drawing identifier to drawing attachment: what the host keeps between load and save.
using PencilAttachmentDictionary = std::map<std::string, std::shared_ptr<TextAttachment>>;

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

namespace PencilDrawings {

// The category's operations, each taking the text first. A drawing's identifier is the
// base name of its files (last path component without extension): "<uuid>" for both
// "<uuid>.jpeg" and "<uuid>.pencildata". Call on the thread that edits the text.

// Replaces `range` (in one editing batch) with one attachment character holding a new
// RVMXScaledImageAttachment of `image` whose drawing is a new RVPencilAttachment of
// `pencilData` (type "public.data"); this writes "<uuid>.pencildata" and "<uuid>.jpeg"
// into the caches directory. A range not wholly inside the text changes nothing and
// writes no file.
CORVEL_EXPORT void insertImage(AttributedString& text, const std::shared_ptr<Image>& image,
                               const std::optional<Data>& pencilData, Range range);
// Identifier to stroke data of every drawing in `range` (clamped): each
// RVMXScaledImageAttachment with a pencilAttachment, keyed by the identifier of the
// filename of the picture's fileWrapper() as it answers now (its own "<uuid>.jpeg" at
// `saving` 1, hence preCutOrCopy). Pictures without a wrapper or filename are skipped;
// a later drawing under the same identifier replaces an earlier one, and one without
// stroke data removes the entry.
CORVEL_EXPORT PencilDataDictionary pencilDataDictionaryForRange(const AttributedString& text,
                                                                Range range);
// Before the host's cut or copy of `range`: every RVMXTextAttachment in it gets
// `saving` 1, then pencilDataDict becomes pencilDataDictionaryForRange(range).
CORVEL_EXPORT void preCutOrCopy(const AttributedString& text, Range range);
// After the host's cut or copy: addPencilDataToClipboard(pencilDataDict); then, only
// when `range` still lies wholly inside the text, every RVMXTextAttachment in it gets
// `saving` 0 (after a cut that shortened the text past the range's end the cut
// attachments keep `saving` 1, as accepted behaviour); last, pencilDataDict is cleared.
CORVEL_EXPORT void postCutOrCopy(const AttributedString& text, Range range);
// Sets the keyed archive of `pencilData` on the general pasteboard under
// RVPencilPasteboardData, beside the types already there. Nothing for an absent or
// empty dictionary. When archiving fails it logs "Failed to copy pencil data to
// clipboard: <reason>" and writes nothing; a backend that refuses the data is not
// reported.
CORVEL_EXPORT void addPencilDataToClipboard(const AttributedString& text,
                                            const std::optional<PencilDataDictionary>& pencilData);
// Reads the general pasteboard's RVPencilPasteboardData item into
// pastedPencilDataDictionary: nothing changes when there is no such item; an item that
// is no keyed archive of a dictionary of strings to data (wrong classes, cycles,
// truncation, any other bytes) sets it to nullopt, silently.
CORVEL_EXPORT void checkForPencilDataOnPaste(const AttributedString& text);
// Takes the drawings out of a loaded text: every attachment whose file wrapper's
// preferredFilename, or failing that its filename, has the extension "pencildata"
// (exactly; "a.PENCILDATA" is not a drawing) loses its attachment attribute. The
// characters stay in the text as plain U+FFFC, so the length does not change. Returns
// identifierForAttachment to attachment (a later one under the same identifier wins).
CORVEL_EXPORT PencilAttachmentDictionary removePencilAttachments(AttributedString& text);
// The identifier of the attachment's file wrapper's preferredFilename when it has one,
// else of its filename; nullopt without an attachment, wrapper or name.
CORVEL_EXPORT std::optional<std::string> identifierForAttachment(
    const AttributedString& text, const std::shared_ptr<TextAttachment>& attachment);
// The identifier of the wrapper's filename only (never preferredFilename, unlike
// identifierForAttachment); nullopt without an attachment, wrapper or filename.
CORVEL_EXPORT std::optional<std::string> fileIDForAttachment(
    const AttributedString& text, const std::shared_ptr<TextAttachment>& attachment);
// For every attachment run in text order whose attachment's wrapper has a name and
// whose identifier is a key of `pencilAttachments`, appends that drawing as one
// attachment character at the end of the text (a picture standing twice appends its
// drawing twice). Keys matching nothing, or no dictionary, leave the text unchanged.
CORVEL_EXPORT void appendPencilAttachments(
    AttributedString& text, const std::optional<PencilAttachmentDictionary>& pencilAttachments);
// Before the host writes the text as RTFD: appendPencilAttachments when
// `pencilAttachments` is present and not empty. `range` is neither read nor written
// (it may be nullptr); the form without a dictionary changes nothing.
CORVEL_EXPORT void preSaveRTFD(AttributedString& text, Range* range);
CORVEL_EXPORT void preSaveRTFD(AttributedString& text, Range* range,
                               const std::optional<PencilAttachmentDictionary>& pencilAttachments);
// After the write: removePencilAttachments, its result dropped. `range` is not used.
CORVEL_EXPORT void postSaveRTFD(AttributedString& text, Range range);
// After the host loaded a document: nothing; a hook kept for the host.
CORVEL_EXPORT void postLoadDocument(AttributedString& text);

}  // namespace PencilDrawings
}  // namespace corvel
