// bench_rtfd: writing and reading attributed text with attachments in the flat RTFD form,
// for texts of 100 K, 1 M and 10 M UTF-16 units with an attachment every 4 K units.
// Prints, per size, the best of 5 runs of: the reference (converting the text to UTF-8,
// one linear pass over it), writing (RTFDFromRange) and reading (attributedStringWithRTFD),
// the writer's and reader's cost as a ratio to the reference, and per operation the
// cost per unit at 10 M over that at 100 K (about 1 when the cost is linear in the text).
// It also checks that each read gives the written text back.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <functional>
#include <random>

#include "Corvelbase/platform/RTFD.h"
#include "Corvelbase/platform/TextAttachment.h"

namespace {

using corvel::AttributedString;
using corvel::Range;
using corvel::String;

// Prose with the characters the writer escapes: braces, backslashes, Latin-1, CJK, emoji,
// tabs and line breaks.
AttributedString makeText(std::size_t size, unsigned seed) {
  static const char16_t* const kWords[] = {
      u"lorem ",      u"ipsum ", u"{dolor} ", u"sit\\amet ", u"caf\u00e9 ",  u"\u65e5\u672c\u8a9e ",
      u"\U0001F600 ", u"\t",     u"\n",       u"elit, ",     u"consectetur "};
  std::mt19937 rng(seed);
  AttributedString text;
  text.beginEditing();
  String run;
  std::size_t nextAttachment = 4096;
  while (text.length() + run.size() < size) {
    run += kWords[rng() % std::size(kWords)];
    if (text.length() + run.size() >= nextAttachment) {
      text.appendAttributedString(AttributedString(run));
      run.clear();
      auto attachment =
          corvel::TextAttachment::initWithData(corvel::Data(1024, 0x5A), "public.data");
      text.appendAttributedString(AttributedString::attributedStringWithAttachment(attachment));
      nextAttachment += 4096;
    }
  }
  text.appendAttributedString(AttributedString(run));
  text.endEditing();
  return text;
}

double bestOf5(const std::function<void()>& work) {
  double best = 1e300;
  for (int i = 0; i < 5; ++i) {
    auto start = std::chrono::steady_clock::now();
    work();
    best = std::min(
        best, std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
  }
  return best;
}

}  // namespace

int main() {
  const std::size_t sizes[] = {100'000, 1'000'000, 10'000'000};
  double perUnit[3][3] = {};
  std::printf("%-10s %12s %12s %12s %10s %10s\n", "units", "reference s", "write s", "read s",
              "write/ref", "read/ref");
  for (std::size_t i = 0; i < std::size(sizes); ++i) {
    AttributedString text = makeText(sizes[i], 7);
    std::size_t units = text.length();
    std::size_t sink = 0;
    double reference = bestOf5([&] { sink += corvel::toUTF8(text.string()).size(); });
    corvel::Data flat;
    double write = bestOf5([&] { flat = corvel::RTFDFromRange(text, Range{0, units}); });
    std::optional<AttributedString> read;
    double readTime = bestOf5([&] { read = corvel::attributedStringWithRTFD(flat); });
    if (!read || read->string() != text.string()) {
      std::fprintf(stderr, "bench_rtfd: the text did not come back at %zu units\n", units);
      return 1;
    }
    std::printf("%-10zu %12.6f %12.6f %12.6f %10.1f %10.1f\n", units, reference, write, readTime,
                write / reference, readTime / reference);
    perUnit[0][i] = reference / units;
    perUnit[1][i] = write / units;
    perUnit[2][i] = readTime / units;
    if (sink == 0) return 1;  // keeps the reference from being optimised away
  }
  std::printf("cost per unit, 10 M over 100 K: reference %.2f, write %.2f, read %.2f\n",
              perUnit[0][2] / perUnit[0][0], perUnit[1][2] / perUnit[1][0],
              perUnit[2][2] / perUnit[2][0]);
  return 0;
}
