// bench_layout: cost of the layout analysis per line as pages grow.
//
// Builds synthetic pages of 100, 1,000 and 10,000 line blocks, each size as three pages
// of two, three and four columns: lines 0.012 high on a 0.016 pitch, paragraphs of three
// to seven lines 0.03 apart, last lines of paragraphs shorter, handed over top to bottom
// and left to right as a recogniser reports them. Pages longer than one sheet simply
// continue below it (y goes negative), so every line keeps a real page's geometry.
// One run = init, add every line, analyse, read the text. Prints the best time per line
// of several runs at each size and the growth ratios 1k/100 and 10k/1k (1.0 is linear).
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <vector>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"

namespace {

using corvel::Rect;
using corvel::RVBlockArray;
using corvel::RVRecognitionBlock;

RVBlockArray syntheticPage(int lines, int columns) {
  struct Placed {
    double x, y, w;
  };
  const double margin = 0.06, gutter = 0.03, height = 0.012, pitch = 0.016, paragraphGap = 0.03;
  const double width = (1.0 - 2 * margin - (columns - 1) * gutter) / columns;
  std::vector<std::vector<Placed>> perColumn(columns);
  unsigned seed = 12345;
  auto next = [&seed] { return (seed = seed * 1103515245u + 12345u) >> 16; };
  for (int c = 0; c < columns; ++c) {
    double x = margin + c * (width + gutter), top = 0.94;
    int count = lines / columns + (c < lines % columns ? 1 : 0);
    int left = 0;
    for (int i = 0; i < count; ++i) {
      bool last = left == 1;
      if (left == 0) left = 3 + static_cast<int>(next() % 5);
      double w = last ? width * (0.3 + (next() % 60) / 100.0) : width;
      perColumn[c].push_back({x, top - height, w});
      top -= last ? height + paragraphGap : pitch;
      --left;
    }
  }
  // Recogniser order: by row from the top, left to right.
  std::vector<Placed> all;
  for (auto& column : perColumn) all.insert(all.end(), column.begin(), column.end());
  std::stable_sort(all.begin(), all.end(),
                   [](const Placed& a, const Placed& b) { return a.y > b.y + 1e-9; });
  RVBlockArray blocks;
  char text[64];
  for (std::size_t i = 0; i < all.size(); ++i) {
    std::snprintf(text, sizeof text, "line %zu of the synthetic page, some words", i);
    blocks.push_back(RVRecognitionBlock::initWithText(corvel::fromUTF8(text),
                                                      Rect{all[i].x, all[i].y, all[i].w, height},
                                                      95.0, corvel::RVRecognitionBlockLevelLine));
  }
  return blocks;
}

// Best seconds per line over the runs, pages rebuilt before each run (analysis changes the
// lines' match types).
double secondsPerLine(int lines) {
  double best = 1e9;
  int runs = lines >= 10000 ? 3 : lines >= 1000 ? 10 : 100;
  for (int run = 0; run < runs; ++run) {
    double total = 0;
    for (int columns = 2; columns <= 4; ++columns) {
      RVBlockArray page = syntheticPage(lines, columns);
      auto start = std::chrono::steady_clock::now();
      auto analyser = corvel::RVTextLayoutAnalyser::init();
      analyser->addRecognitionBlocks(page);
      analyser->analyse(corvel::Size{2480, 3508}, 0);
      volatile std::size_t length = analyser->text().size();
      (void)length;
      total += std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    }
    best = std::min(best, total / (3.0 * lines));
  }
  return best;
}

}  // namespace

int main() {
  const int sizes[] = {100, 1000, 10000};
  double perLine[3];
  for (int i = 0; i < 3; ++i) {
    perLine[i] = secondsPerLine(sizes[i]);
    std::printf("layout %6d lines: %8.3f us per line\n", sizes[i], perLine[i] * 1e6);
  }
  std::printf("growth of the cost per line: 1k/100 = %.2f, 10k/1k = %.2f (1.0 = linear)\n",
              perLine[1] / perLine[0], perLine[2] / perLine[1]);
  return 0;
}
