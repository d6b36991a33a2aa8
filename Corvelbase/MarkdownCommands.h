// Markdown editing commands for a plain-text editor.
//
// Every command takes the editor's whole text first and the current selection, never
// changes the text, and answers with the string the editor is to put in place of a
// replacement range. Where a command writes a selection range, the editor selects it
// afterwards; it is in coordinates of the text after the replacement. So a command is
// applied as:
//
//   Range replaced, selected;
//   String out = MarkdownCommands::insertTaskList(text, selection, &replaced, &selected);
//   text.replace(replaced.location, replaced.length, out);  // then select `selected`
//
// Out-parameters marked "if given" may be nullptr: nothing is written there. A command that
// writes no range leaves the pointee untouched.
//
// Lines. Commands work on the lines a selection touches, with the line model of
// Corvelbase/platform/Lines.h: a line ends right after a line feed, a carriage return stays
// part of its line's text, and every line keeps its terminator. The cost of a call follows
// the lines the selection touches, not the size of the text.
//
// Selections outside the text. Every `range` argument is first clamped to the text: a
// location beyond the end becomes the end, and a length that runs past the end (including
// one whose location + length overflows) is cut at the end. In-range selections are not
// changed by this. Written ranges are computed from the clamped selection, so a replacement
// range always lies inside the text. After clamping every selection touches at least one
// line item (see `linesForRange`), so the "no lines" answers below are a fallback that
// these functions do not reach.
//
// UTF-16. All locations and lengths count UTF-16 code units. Unpaired surrogates are
// ordinary units; a selection that splits a surrogate pair is taken as given.
//
// Pure functions of their arguments; safe to call concurrently from any thread.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel::MarkdownCommands {

// Keys of a line item in its dictionary form (the command-line tool prints them).
inline constexpr std::string_view kLineItemLineKey = "Line";
inline constexpr std::string_view kLineItemRangeKey = "Range";

// One line touched by a selection: its text, terminator included, and its range in the
// text. The one exception is the empty item described under `linesForRange`.
struct LineItem {
  String line;
  Range range;
  friend bool operator==(const LineItem&, const LineItem&) = default;
};

// Largest header level and table size a command builds; larger values are treated as
// these. They keep a stray huge argument (2^63, say) from asking for more memory than
// exists, and are far beyond any real header or table.
inline constexpr std::uint64_t kMaxHeaderLevel = 1024;
inline constexpr std::uint64_t kMaxTableDimension = 1024;

// ---------------------------------------------------------------------------------------
// Line model

// The lines touched by `range`, in text order: every line that shares at least one unit
// with the selection, or that holds its location. A selection that ends exactly at the
// start of a line does not take that line; an empty selection at a line start takes that
// line only. A caret at the very end of a text whose last line has no line feed takes that
// last line. A caret at the end of the empty text, or of a text that ends with a line
// feed, takes no real line: the result is then one item with the empty line "" and the
// (clamped) selection itself as its range.
CORVEL_EXPORT std::vector<LineItem> linesForRange(const String& text, Range range);

// The item's range; NotFoundRange for nullptr.
CORVEL_EXPORT Range rangeForItem(const String& text, const LineItem* item);

// ---------------------------------------------------------------------------------------
// Links and headers

// Whether a Markdown link '[text](url)' on the selection's first line covers the selection
// (shares a unit with it, or, for a caret, holds it). Sets `*linkRange` (required; with
// nullptr the answer is still given) to the link, from "[" to ")", or NotFoundRange when
// there is none. `*textRange` (if given) is set to the characters between the brackets of
// the last "](" seen, even for a link that was then rejected.
// CAVEAT: the scan remembers the latest "[" and whether any "](" was seen for the whole
// line, so after a rejected link a later ")" closes a "link" that starts at the latest "["
// even without its own "](". '[a](u) x)' with the caret on 'x' reports (0, 9).
CORVEL_EXPORT bool lineContainsMarkdownLink(const String& text, Range range, Range* linkRange,
                                            Range* textRange = nullptr);

// '[selected text](url)'. Writes no range: the editor replaces `range` (clamped) itself.
CORVEL_EXPORT String insertMarkdownLink(const String& text, const String& url, Range range);

// The header prefix for `level`: that many "#" and a space; "" for level 0. No upper limit
// other than kMaxHeaderLevel: headerForLevel(text, 7) is "####### ".
CORVEL_EXPORT String headerForLevel(const String& text, std::uint64_t level);

// Sets the header level of the selection's first line. Replaces the line's leading "#"
// (counted up to six; a seventh is not looked at and stays) and one following space, or
// inserts at the line start when the line has no "#". Applying the level a line already
// has removes the header. Returns "" and writes nothing when there are no lines.
// Examples: level 2 on '## Title' -> "" over '## '; level 3 -> '### ' over '## '.
CORVEL_EXPORT String setMarkdownHeaderLevel(const String& text, std::uint64_t level, Range range,
                                            Range* replacementRange = nullptr);

// Raises the header of the selection's first line by one: "# " at the start of a plain
// line, "#" inserted before a header of one to five "#", and a header of six "#" removed
// (with its following space). Seven or more "#" count as six and lose only the first six.
CORVEL_EXPORT String incrementMarkdownHeader(const String& text, Range range,
                                             Range* replacementRange = nullptr);

// ---------------------------------------------------------------------------------------
// Line prefixes

// Toggles `prefix` at the start of the touched lines (only the first one when
// `firstLineOnly`): a line that starts with the prefix loses it, any other line gets it.
// A line shorter than the prefix never carries it. Returns the rewritten lines; the
// replacement range covers the touched lines whole.
// Selection: a caret inside the first line keeps its distance from the line's end (so a
// caret at a line start moves behind an inserted prefix, though never before the line
// start); a non-empty selection that starts at a line start keeps that start and grows to
// take in the prefix; the selection end keeps its distance from the end of its line. A
// length that would come out negative (an end inside a removed prefix) is 0.
//
// CAVEAT: the written selection can lie past the end of the new text. The caret moves
// only when it lies before the end of its line, so a caret at the very end of a last
// line without a line feed stays where it was while a prefix is removed in front of it:
// toggling bullets off in "- a" with the caret at 3 gives "a" and the selection (3, 0),
// in a text of 1 unit. This is how the selection rule is defined, and it is kept; a host
// clamps the selection to the new text's length before selecting it.
CORVEL_EXPORT String insertAtStartOfLine(const String& text, const String& prefix, Range range,
                                         bool firstLineOnly, Range* replacementRange = nullptr,
                                         Range* selectionRange = nullptr);

// insertAtStartOfLine with "- [ ] " (task list), "- " (bullets) and "> " (quote) on every
// touched line; each toggles.
CORVEL_EXPORT String insertTaskList(const String& text, Range range,
                                    Range* replacementRange = nullptr,
                                    Range* selectionRange = nullptr);
CORVEL_EXPORT String insertUnorderedList(const String& text, Range range,
                                         Range* replacementRange = nullptr,
                                         Range* selectionRange = nullptr);
CORVEL_EXPORT String insertQuote(const String& text, Range range, Range* replacementRange = nullptr,
                                 Range* selectionRange = nullptr);

// insertAtStartOfLine with "___\n" on the first touched line only; no selection range. A
// first line that is exactly "___\n" is removed.
CORVEL_EXPORT String insertHorizontalLine(const String& text, Range range,
                                          Range* replacementRange = nullptr);

// Whether `line` starts with a number prefix: the first match of the ICU expression
// "^(\s*)(\d+\.\s+)" starts at 0. Then `*range` (required; with nullptr the answer is still
// given) is set to the match: leading white space and the number part, such as '12. '.
// "\s" also matches line breaks, so '1.' followed by a line feed counts and the match takes
// the line feed. "\d" is any Unicode decimal digit. A line longer than 2^31 - 1 units is
// examined on its first 2^31 - 1 units.
CORVEL_EXPORT bool containsNumberedList(const String& line, Range* range);

// Numbers the touched lines "1. ", "2. ", ... by their place among them (empty lines too),
// replacing any number they had; when the first touched line is already numbered, removes
// the numbers of all touched lines instead. A line whose whole text was its number becomes
// "\n". Selection arithmetic as in insertAtStartOfLine.
// Examples: 'a\nb\nc' -> '1. a\n2. b\n3. c'; '1. a\n2. b' -> 'a\nb'; 'x\n7. y' -> '1. x\n2. y'.
CORVEL_EXPORT String insertNumberedList(const String& text, Range range,
                                        Range* replacementRange = nullptr,
                                        Range* selectionRange = nullptr);

// ---------------------------------------------------------------------------------------
// Code, tables and alignment

// '`selected text`', or "``" for an empty selection. Writes no range.
CORVEL_EXPORT String insertInlineCodeBlock(const String& text, Range range);

// A fenced code block holding the selected text, to replace the selection: "```\n", the
// text, "\n", "```\n", preceded by "\n" unless the selection starts at a line start. A
// selection that ends with a line feed thus gets an empty line before the closing fence.
// nullopt (and nothing written) when there are no lines.
CORVEL_EXPORT std::optional<String> insertCodeBlock(const String& text, Range range,
                                                    Range* replacementRange = nullptr);

// An empty table inserted after the last touched line and its terminator (replacement
// range (end of that line, 0)): "\n", then rows + 1 lines of `columns` cells, the second
// of them the alignment line "|:--|:--|...". So `rows` counts the header line and the body
// lines; rows 0 gives the header line alone, columns 0 gives lines of just "|".
// Rows 2, columns 3: '\n|   |   |   |\n|:--|:--|:--|\n|   |   |   |\n'.
// Rows and columns beyond kMaxTableDimension are treated as kMaxTableDimension.
CORVEL_EXPORT String insertTable(const String& text, Range range, std::uint64_t rows,
                                 std::uint64_t columns, Range* replacementRange = nullptr);

// The opening tag '<div align="center">\n' for 1, "right" for 2, "left" for any other value.
CORVEL_EXPORT String justifyString(const String& text, std::int64_t alignment);

// The touched lines wrapped in justifyString(alignment) and "</div>\n"; the replacement
// range covers the lines whole. The closing tag follows the last line's text directly, so
// after a last line without a line feed it shares that line: 'b</div>\n'.
CORVEL_EXPORT String insertHTMLJustity(const String& text, std::int64_t alignment, Range range,
                                       Range* replacementRange = nullptr);

}  // namespace corvel::MarkdownCommands
