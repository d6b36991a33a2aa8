#include "Corvelbase/platform/Lines.h"

namespace corvel {

std::vector<String> lines(std::u16string_view text) {
  std::vector<String> result;
  std::size_t start = 0;
  while (start < text.size()) {
    std::size_t feed = text.find(u'\n', start);
    std::size_t end = feed == std::u16string_view::npos ? text.size() : feed + 1;
    result.emplace_back(text.substr(start, end - start));
    start = end;
  }
  return result;
}

char16_t lastCharacter(std::u16string_view text) { return text.empty() ? u'\0' : text.back(); }

}  // namespace corvel
