#include "Corvelbase/AsianCharacters.h"

#include <unicode/ubrk.h>

#include <climits>
#include <memory>

namespace corvel::AsianCharacters {
namespace {

// U+2E80 to U+9FFF in one unsigned comparison: units below the start wrap to large values.
constexpr uint32_t kRangeStart = 0x2E80;
constexpr uint32_t kRangeBlocks = 226;  // (0x9FFF - 0x2E80) >> 7
constexpr bool isAsianUnit(char16_t unit) {
  return ((static_cast<uint32_t>(unit) - kRangeStart) >> 7) <= kRangeBlocks;
}

struct BreakCloser {
  void operator()(UBreakIterator* it) const { ubrk_close(it); }
};
using BreakIterator = std::unique_ptr<UBreakIterator, BreakCloser>;

// One grapheme iterator per thread: opening one costs far more than a short scan.
UBreakIterator* graphemeIterator(const String& text) {
  thread_local BreakIterator iterator = [] {
    UErrorCode status = U_ZERO_ERROR;
    BreakIterator it(ubrk_open(UBRK_CHARACTER, "", nullptr, 0, &status));
    return U_SUCCESS(status) ? std::move(it) : BreakIterator();
  }();
  if (!iterator) return nullptr;
  UErrorCode status = U_ZERO_ERROR;
  ubrk_setText(iterator.get(), text.data(), static_cast<int32_t>(text.size()), &status);
  return U_SUCCESS(status) ? iterator.get() : nullptr;
}

}  // namespace

bool containsAsianCharactersByWalking(const String& text) {
  if (text.empty() || text.size() > INT32_MAX) return false;
  UBreakIterator* it = graphemeIterator(text);
  if (it == nullptr) return false;
  bool found = false;
  for (int32_t start = ubrk_first(it);
       start != UBRK_DONE && start < static_cast<int32_t>(text.size()); start = ubrk_next(it)) {
    if (isAsianUnit(text[static_cast<std::size_t>(start)])) found = true;
  }
  return found;
}

bool containsAsianCharacters(const String& text) {
  if (text.empty() || text.size() > INT32_MAX) return false;
  // Most text has no unit in the range at all, and then no sequence can start with one.
  // Only a unit of the range is worth a question to the iterator: does a sequence start
  // here?
  UBreakIterator* it = nullptr;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (!isAsianUnit(text[i])) continue;
    if (it == nullptr && (it = graphemeIterator(text)) == nullptr) return false;
    if (ubrk_isBoundary(it, static_cast<int32_t>(i))) return true;
  }
  return false;
}

}  // namespace corvel::AsianCharacters
