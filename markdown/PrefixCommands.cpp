// Commands that rewrite the start of every touched line: the prefix engine behind task
// lists, bullets, quotes and horizontal lines, and numbered lists.
#include <algorithm>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>

#include <unicode/regex.h>
#include <unicode/unistr.h>

#include "Corvelbase/MarkdownCommands.h"
#include "markdown/Selection.h"

namespace corvel::MarkdownCommands {

namespace {

constexpr char16_t kTaskListPrefix[] = u"- [ ] ";
constexpr char16_t kUnorderedListPrefix[] = u"- ";
constexpr char16_t kQuotePrefix[] = u"> ";
constexpr char16_t kHorizontalLinePrefix[] = u"___\n";
// "\s" matches line breaks too, so '1.' then a line feed is a number prefix (the match
// takes the line feed); editors rely on that, so it stays.
constexpr char16_t kNumberPrefixPattern[] = u"^(\\s*)(\\d+\\.\\s+)";

bool startsWith(const String& line, const String& prefix) {
  return line.size() >= prefix.size() && line.compare(0, prefix.size(), prefix) == 0;
}

// Compiled once; ICU patterns are safe to share between threads once built.
const icu::RegexPattern* numberPrefixPattern() {
  static std::once_flag once;
  static std::unique_ptr<icu::RegexPattern> pattern;
  std::call_once(once, [] {
    UErrorCode status = U_ZERO_ERROR;
    UParseError parseError;
    pattern.reset(icu::RegexPattern::compile(icu::UnicodeString(kNumberPrefixPattern), 0,
                                             parseError, status));
    if (U_FAILURE(status)) pattern.reset();
  });
  return pattern.get();
}

String numbered(std::size_t number, const String& rest) {
  std::string digits = std::to_string(number);
  return String(digits.begin(), digits.end()) + u". " + rest;
}

}  // namespace

String insertAtStartOfLine(const String& text, const String& prefix, Range range,
                           bool firstLineOnly, Range* replacementRange, Range* selectionRange) {
  const Range selection = detail::clampToText(text, range);
  std::vector<LineItem> items = linesForRange(text, selection);
  const std::uint64_t first = items.empty() ? selection.location : items.front().range.location;
  detail::SelectionTracker tracker(selection, first);
  Range replaced{first, 0};
  String output;

  for (std::size_t i = 0; i < items.size(); ++i) {
    const LineItem& item = items[i];
    String line;
    if (i == 0 || !firstLineOnly) {
      // Toggle: a line that carries the prefix loses it.
      line = startsWith(item.line, prefix) ? item.line.substr(prefix.size()) : prefix + item.line;
    } else {
      line = item.line;
    }
    output += line;
    tracker.lineRewritten(item.range, line.size(), output.size());
    replaced.length += item.range.length;
  }
  if (output.empty() && items.empty()) output = prefix;

  if (replacementRange) *replacementRange = replaced;
  if (selectionRange) *selectionRange = tracker.selection();
  return output;
}

String insertTaskList(const String& text, Range range, Range* replacementRange,
                      Range* selectionRange) {
  return insertAtStartOfLine(text, kTaskListPrefix, range, false, replacementRange, selectionRange);
}

String insertUnorderedList(const String& text, Range range, Range* replacementRange,
                           Range* selectionRange) {
  return insertAtStartOfLine(text, kUnorderedListPrefix, range, false, replacementRange,
                             selectionRange);
}

String insertQuote(const String& text, Range range, Range* replacementRange,
                   Range* selectionRange) {
  return insertAtStartOfLine(text, kQuotePrefix, range, false, replacementRange, selectionRange);
}

String insertHorizontalLine(const String& text, Range range, Range* replacementRange) {
  return insertAtStartOfLine(text, kHorizontalLinePrefix, range, true, replacementRange, nullptr);
}

bool containsNumberedList(const String& line, Range* range) {
  const icu::RegexPattern* pattern = numberPrefixPattern();
  if (!pattern) return false;
  // ICU counts in 32-bit lengths; the prefix of a longer line is what can match anyway.
  auto length = static_cast<std::int32_t>(
      std::min<std::size_t>(line.size(), static_cast<std::size_t>(INT32_MAX)));
  icu::UnicodeString input(false, line.data(), length);  // read-only alias, no copy
  UErrorCode status = U_ZERO_ERROR;
  std::unique_ptr<icu::RegexMatcher> matcher(pattern->matcher(input, status));
  if (U_FAILURE(status) || !matcher->find(status) || U_FAILURE(status)) return false;
  std::int32_t start = matcher->start(status);
  std::int32_t end = matcher->end(status);
  if (U_FAILURE(status) || start != 0) return false;
  if (range) *range = Range{0, static_cast<std::uint64_t>(end)};
  return true;
}

String insertNumberedList(const String& text, Range range, Range* replacementRange,
                          Range* selectionRange) {
  const Range selection = detail::clampToText(text, range);
  std::vector<LineItem> items = linesForRange(text, selection);
  const std::uint64_t first = items.empty() ? selection.location : items.front().range.location;
  detail::SelectionTracker tracker(selection, first);
  Range replaced{first, 0};
  String output;
  bool removing = false;

  for (std::size_t i = 0; i < items.size(); ++i) {
    const LineItem& item = items[i];
    Range number;
    String line;
    if (containsNumberedList(item.line, &number)) {
      String rest = item.line.substr(static_cast<std::size_t>(number.max()));
      // A numbered first line turns the command into removing numbers from every line.
      if (i == 0 || removing) {
        removing = true;
        line = rest;
      } else {
        line = numbered(i + 1, rest);
      }
    } else {
      line = removing ? item.line : numbered(i + 1, item.line);
    }
    output += line.empty() ? String(u"\n") : line;
    tracker.lineRewritten(item.range, line.size(), output.size());
    replaced.length += item.range.length;
  }

  if (replacementRange) *replacementRange = replaced;
  if (selectionRange) *selectionRange = tracker.selection();
  return output;
}

}  // namespace corvel::MarkdownCommands
