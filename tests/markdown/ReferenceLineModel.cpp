#include "ReferenceLineModel.h"

#include <algorithm>

#include "Corvelbase/platform/Lines.h"

namespace corvel::testing {

std::vector<MarkdownCommands::LineItem> referenceLinesForRange(const String& text, Range range) {
  // The library's documented clamping, done independently.
  std::uint64_t size = text.size();
  std::uint64_t loc = range.location > size ? size : range.location;
  std::uint64_t len = range.length > size - loc ? size - loc : range.length;
  Range s{loc, len};

  std::vector<MarkdownCommands::LineItem> taken;
  std::vector<String> all = lines(text);
  std::uint64_t position = 0;
  for (std::size_t i = 0; i < all.size(); ++i) {
    Range r{position, all[i].size()};
    // Shares a unit with the selection, or holds its location.
    bool touches = std::max(s.location, r.location) < std::min(s.max(), r.max()) ||
                   (r.location <= loc && loc < r.max());
    bool lastWithoutFeed = i + 1 == all.size() && taken.empty() && lastCharacter(all[i]) != u'\n';
    if (touches || lastWithoutFeed) taken.push_back({all[i], r});
    position = r.max();
  }
  if (taken.empty() && position == loc) taken.push_back({String(), s});
  return taken;
}

String applyEdit(const String& text, Range range, const String& replacement) {
  String out = text;
  out.replace(static_cast<std::size_t>(range.location), static_cast<std::size_t>(range.length),
              replacement);
  return out;
}

}  // namespace corvel::testing
