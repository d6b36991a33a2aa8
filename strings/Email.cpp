#include "Corvelbase/Email.h"

#include <unicode/uregex.h>

#include <climits>
#include <memory>

namespace corvel::Email {
namespace {

constexpr std::u16string_view kHeaderPatternStart = u"^(?:";
constexpr std::u16string_view kHeaderPatternEnd = u":)\\s(.*)$";
constexpr std::u16string_view kAddressPattern = u"([^\\s<,;\\.=]+@[^>\\s]+)";
// The platform's option bits 1 (case-insensitive) and 16 (anchors match lines) in ICU's
// numbering.
constexpr uint32_t kHeaderFlags = UREGEX_CASE_INSENSITIVE | UREGEX_MULTILINE;
constexpr uint32_t kAddressFlags = UREGEX_CASE_INSENSITIVE;
// ICU counts match steps in units of about a million; this stops a pathological field
// pattern after about a second instead of hanging the caller.
constexpr int32_t kMatchTimeLimit = 1000;

struct RegexCloser {
  void operator()(URegularExpression* re) const { uregex_close(re); }
};
using Regex = std::unique_ptr<URegularExpression, RegexCloser>;

// The first match's one capture group: the substring of `text`, or nullopt when the
// pattern is invalid, does not match, or has another number of groups.
std::optional<String> firstGroup(std::u16string_view pattern, uint32_t flags,
                                 std::u16string_view text) {
  if (pattern.size() > INT32_MAX || text.size() > INT32_MAX) return std::nullopt;
  UErrorCode status = U_ZERO_ERROR;
  UParseError parseError;
  Regex re(uregex_open(pattern.data(), static_cast<int32_t>(pattern.size()), flags, &parseError,
                       &status));
  if (U_FAILURE(status) || !re) return std::nullopt;
  uregex_setTimeLimit(re.get(), kMatchTimeLimit, &status);
  // The whole match and exactly one group, or no answer.
  if (uregex_groupCount(re.get(), &status) != 1 || U_FAILURE(status)) return std::nullopt;
  uregex_setText(re.get(), text.data(), static_cast<int32_t>(text.size()), &status);
  if (U_FAILURE(status) || !uregex_find(re.get(), 0, &status) || U_FAILURE(status))
    return std::nullopt;
  int32_t start = uregex_start(re.get(), 1, &status);
  int32_t end = uregex_end(re.get(), 1, &status);
  if (U_FAILURE(status) || start < 0 || end < start) return std::nullopt;
  return String(
      text.substr(static_cast<std::size_t>(start), static_cast<std::size_t>(end - start)));
}

}  // namespace

std::optional<String> headerValueForField(const String& message, const String& field) {
  if (field.size() > kMaxHeaderFieldLength) return std::nullopt;
  String pattern;
  pattern.reserve(kHeaderPatternStart.size() + field.size() + kHeaderPatternEnd.size());
  pattern.append(kHeaderPatternStart).append(field).append(kHeaderPatternEnd);
  return firstGroup(pattern, kHeaderFlags, message);
}

std::optional<String> headerValueForField(const String& message, const String& field,
                                          bool extractEmailAddress) {
  std::optional<String> value = headerValueForField(message, field);
  if (!extractEmailAddress || !value || value->empty()) return value;
  return firstGroup(kAddressPattern, kAddressFlags, *value);
}

}  // namespace corvel::Email
