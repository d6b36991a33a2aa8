// Links and headers: both look at the first line the selection touches only.
#include <algorithm>

#include "Corvelbase/MarkdownCommands.h"
#include "markdown/Selection.h"

namespace corvel::MarkdownCommands {

namespace {

constexpr std::size_t kHeaderLevelsCounted = 6;

bool intersects(Range a, Range b) {
  return std::max(a.location, b.location) < std::min(a.max(), b.max());
}

bool holds(Range range, std::uint64_t location) {
  return range.location <= location && location < range.max();
}

// Leading "#" of `line`, counted up to six.
std::size_t leadingHashes(const String& line) {
  std::size_t count = 0;
  while (count < kHeaderLevelsCounted && count < line.size() && line[count] == u'#') ++count;
  return count;
}

}  // namespace

bool lineContainsMarkdownLink(const String& text, Range range, Range* linkRange, Range* textRange) {
  const Range selection = detail::clampToText(text, range);
  Range link = NotFoundRange;
  std::vector<LineItem> items = linesForRange(text, selection);
  if (items.empty()) {
    if (linkRange) *linkRange = link;
    return false;
  }
  const String& line = items.front().line;
  const std::uint64_t base = items.front().range.location;

  // The open index and the close mark live for the whole line on purpose: a ")" after a
  // rejected link closes a new "link" from the latest "[" (see the header's CAVEAT).
  bool open = false;
  std::size_t openIndex = 0;
  bool closed = false;
  for (std::size_t j = 0; j < line.size(); ++j) {
    char16_t c = line[j];
    if (c == u'[') {
      open = true;
      openIndex = j;
    } else if (open && c == u']' && j + 1 < line.size() && line[j + 1] == u'(') {
      if (textRange) *textRange = Range{base + openIndex + 1, j - openIndex - 1};
      closed = true;
    } else if (closed && c == u')') {
      link = Range{base + openIndex, j - openIndex + 1};
      if (intersects(link, selection)) break;
      if (selection.length == 0 && holds(link, selection.location)) break;
      link = NotFoundRange;
    }
  }
  if (linkRange) *linkRange = link;
  return link.location != NotFound;
}

String insertMarkdownLink(const String& text, const String& url, Range range) {
  return u"[" + detail::substring(text, detail::clampToText(text, range)) + u"](" + url + u")";
}

String headerForLevel(const String&, std::uint64_t level) {
  level = std::min(level, kMaxHeaderLevel);
  if (level == 0) return String();
  String header(static_cast<std::size_t>(level), u'#');
  header.push_back(u' ');
  return header;
}

String setMarkdownHeaderLevel(const String& text, std::uint64_t level, Range range,
                              Range* replacementRange) {
  std::vector<LineItem> items = linesForRange(text, range);
  if (items.empty()) return String();
  const String& line = items.front().line;
  const std::uint64_t base = items.front().range.location;

  Range replaced{base, 0};
  std::uint64_t produce = level;
  if (!line.empty() && line.front() == u'#') {
    std::size_t counted = leadingHashes(line);
    std::size_t covered = counted;
    if (covered < line.size() && line[covered] == u' ') ++covered;
    replaced.length = covered;
    // The level a line already has toggles its header off.
    if (counted == level) produce = 0;
  }
  if (replacementRange) *replacementRange = replaced;
  return headerForLevel(text, produce);
}

String incrementMarkdownHeader(const String& text, Range range, Range* replacementRange) {
  std::vector<LineItem> items = linesForRange(text, range);
  if (items.empty()) return String();
  const String& line = items.front().line;
  const std::uint64_t base = items.front().range.location;

  String result;
  Range replaced{base, 0};
  if (line.empty() || line.front() != u'#') {
    result = u"# ";
  } else if (leadingHashes(line) == kHeaderLevelsCounted) {
    // Level six wraps to no header; a seventh "#" is not looked at and stays.
    bool spaceFollows = line.size() > kHeaderLevelsCounted && line[kHeaderLevelsCounted] == u' ';
    replaced.length = kHeaderLevelsCounted + (spaceFollows ? 1 : 0);
  } else {
    result = u"#";
  }
  if (replacementRange) *replacementRange = replaced;
  return result;
}

}  // namespace corvel::MarkdownCommands
