// Commands that wrap or follow the selection: inline code, fenced code, tables and HTML
// alignment blocks.
#include <algorithm>

#include "Corvelbase/MarkdownCommands.h"
#include "markdown/Selection.h"

namespace corvel::MarkdownCommands {

namespace {

constexpr char16_t kFence[] = u"```\n";
constexpr char16_t kHeaderCell[] = u"|   ";
constexpr char16_t kAlignmentCell[] = u"|:--";
constexpr char16_t kRowEnd[] = u"|\n";
constexpr char16_t kClosingDiv[] = u"</div>\n";

}  // namespace

String insertInlineCodeBlock(const String& text, Range range) {
  const Range selection = detail::clampToText(text, range);
  if (selection.length == 0) return u"``";
  String code(u"`");
  code.append(text, static_cast<std::size_t>(selection.location),
              static_cast<std::size_t>(selection.length));
  code.push_back(u'`');
  return code;
}

std::optional<String> insertCodeBlock(const String& text, Range range, Range* replacementRange) {
  const Range selection = detail::clampToText(text, range);
  std::vector<LineItem> items = linesForRange(text, selection);
  if (items.empty()) return std::nullopt;
  // The fence must start a line of its own.
  String lead = selection.location == rangeForItem(text, &items.front()).location ? u"" : u"\n";
  // The body's own final line feed, if any, is followed by another: an empty line before
  // the closing fence, kept so that the block reads the same however it was selected.
  String block = lead + kFence + detail::substring(text, selection) + u"\n" + kFence;
  if (replacementRange) *replacementRange = selection;
  return block;
}

String insertTable(const String& text, Range range, std::uint64_t rows, std::uint64_t columns,
                   Range* replacementRange) {
  std::vector<LineItem> items = linesForRange(text, range);
  if (items.empty()) return String();
  rows = std::min(rows, kMaxTableDimension);
  columns = std::min(columns, kMaxTableDimension);

  String table(u"\n");
  table.reserve(1 + (rows + 1) * (columns * 4 + 2));
  for (std::uint64_t row = 0; row <= rows; ++row) {
    // The alignment line comes second, under the header line.
    const char16_t* cell = row == 1 ? kAlignmentCell : kHeaderCell;
    for (std::uint64_t column = 0; column < columns; ++column) table += cell;
    table += kRowEnd;
  }
  if (replacementRange) *replacementRange = Range{items.back().range.max(), 0};
  return table;
}

String justifyString(const String&, std::int64_t alignment) {
  const char16_t* value = alignment == 1 ? u"center" : alignment == 2 ? u"right" : u"left";
  return u"<div align=\"" + String(value) + u"\">\n";
}

String insertHTMLJustity(const String& text, std::int64_t alignment, Range range,
                         Range* replacementRange) {
  const Range selection = detail::clampToText(text, range);
  String output = justifyString(text, alignment);
  std::vector<LineItem> items = linesForRange(text, selection);
  if (items.empty()) {
    if (replacementRange) *replacementRange = Range{selection.location, 0};
    return String();
  }
  Range replaced{items.front().range.location, 0};
  for (const LineItem& item : items) {
    output += item.line;
    replaced.length += item.range.length;
  }
  output += kClosingDiv;
  if (replacementRange) *replacementRange = replaced;
  return output;
}

}  // namespace corvel::MarkdownCommands
