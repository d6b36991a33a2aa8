// The lines a selection touches, found by looking only around the selection: from the line
// feed before its start to the line feed after its end. An editor calls this on every
// command, so its cost must not grow with the document.
#include <string_view>

#include "Corvelbase/MarkdownCommands.h"
#include "markdown/Selection.h"

namespace corvel::MarkdownCommands {

namespace {

constexpr char16_t kLineFeed = u'\n';

// Start of the line that holds `index`, or of the line that ends at `index` when `index`
// is the end of a text without a final line feed.
std::size_t lineStart(std::u16string_view text, std::size_t index) {
  if (index == 0) return 0;
  std::size_t feed = text.rfind(kLineFeed, index - 1);
  return feed == std::u16string_view::npos ? 0 : feed + 1;
}

// End (after the line feed, or the text's end) of the line that starts at `start`.
std::size_t lineEnd(std::u16string_view text, std::size_t start) {
  std::size_t feed = text.find(kLineFeed, start);
  return feed == std::u16string_view::npos ? text.size() : feed + 1;
}

LineItem itemFor(std::u16string_view text, std::size_t start, std::size_t end) {
  return LineItem{String(text.substr(start, end - start)), Range{start, end - start}};
}

}  // namespace

std::vector<LineItem> linesForRange(const String& text, Range range) {
  const Range selection = detail::clampToText(text, range);
  const std::u16string_view view(text);
  const std::size_t size = view.size();
  const auto location = static_cast<std::size_t>(selection.location);
  std::vector<LineItem> items;

  if (location < size) {
    // Every line from the one holding the start to the one holding the last selected unit.
    std::size_t last = location + static_cast<std::size_t>(selection.length);
    if (last > location) --last;
    for (std::size_t start = lineStart(view, location); start <= last;) {
      std::size_t end = lineEnd(view, start);
      items.push_back(itemFor(view, start, end));
      start = end;
    }
  } else if (size > 0 && view.back() != kLineFeed) {
    // A caret at the very end belongs to a last line that has no line feed.
    items.push_back(itemFor(view, lineStart(view, size), size));
  } else {
    // After a final line feed, or in the empty text, the caret is on a line of its own.
    items.push_back(LineItem{String(), selection});
  }
  return items;
}

Range rangeForItem(const String&, const LineItem* item) {
  return item ? item->range : NotFoundRange;
}

}  // namespace corvel::MarkdownCommands
