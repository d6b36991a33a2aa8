// bench_png_decode: what decoding a PNG costs next to reading the page it holds.
//
// For every 8-bit PNG among the real pages of the shared corpus, the rendered A4 pages
// of tests/fixtures/ocr/pages and the hard pages bench_ocr_quality renders into the
// working directory (when present), it times a whole decode of the file through `Image` (the best
// of five) and one OCR job of the same page at the accurate level, alone on the queue, and prints
// the decode's share of the page. Decoding happens once per page inside the job, so the share
// bounds what any faster PNG reader could save on a page.
//
// Usage: bench_png_decode [--limit N]   (N pages at most, default all)
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"

namespace {

using namespace corvel;
namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

double since(Clock::time_point start) {
  return std::chrono::duration<double>(Clock::now() - start).count();
}

// PNGs whose IHDR says 8 bits per sample: the ones a scanner or renderer usually writes
// and the ones a quicker reader would take.
bool eightBitPng(const fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  unsigned char header[25] = {};
  if (!in.read(reinterpret_cast<char*>(header), sizeof header)) return false;
  return std::memcmp(header + 1, "PNG", 3) == 0 && header[24] == 8;
}

std::vector<fs::path> pngsIn(const fs::path& dir) {
  std::vector<fs::path> out;
  if (!fs::is_directory(dir)) return out;
  for (const auto& entry : fs::directory_iterator(dir))
    if (entry.path().extension() == ".png" && eightBitPng(entry.path()))
      out.push_back(entry.path());
  std::sort(out.begin(), out.end());
  return out;
}

double decodeSeconds(const fs::path& path) {
  double best = 1e9;
  for (int i = 0; i < 5; ++i) {
    auto start = Clock::now();
    auto image = Image::initByReferencingFile(path.string());
    if (!image->bitmap()) {
      std::fprintf(stderr, "%s: %s\n", path.c_str(), image->failureReason().c_str());
      std::exit(1);
    }
    best = std::min(best, since(start));
  }
  return best;
}

double pageSeconds(const fs::path& path) {
  bool finished = false;
  auto start = Clock::now();
  auto job = RVVisionOCR::init();
  job->startOcrImageAtPath(fromUTF8(path.string()), {"en-US"}, false,
                           [&](const String&, const std::optional<Error>&) { finished = true; });
  MainQueue::runUntil([&] { return finished; });
  return since(start);
}

}  // namespace

int main(int argc, char** argv) {
  std::size_t limit = SIZE_MAX;
  for (int i = 1; i + 1 < argc; ++i)
    if (std::strcmp(argv[i], "--limit") == 0) limit = std::strtoul(argv[++i], nullptr, 10);

  fs::path fixtures = CORVEL_FIXTURES_DIR;
  fs::path source = fixtures.parent_path().parent_path();
  std::vector<fs::path> pages;
  for (const fs::path& dir : {source.parent_path() / "shared" / "ocr-corpus" / "images",
                              fixtures / "ocr" / "pages", fs::current_path() / "ocr-hard-pages"})
    for (auto& page : pngsIn(dir)) pages.push_back(page);
  if (pages.size() > limit) pages.resize(limit);
  if (pages.empty()) {
    std::fprintf(stderr, "no 8-bit PNG pages found\n");
    return 1;
  }

  PlatformRegistry::setTextRecognizer(TesseractRecognizer::init());
  RVVisionOCR::ocrQueue();
  pageSeconds(pages.front());  // the engine starts once, outside the figures

  double decodeTotal = 0, pageTotal = 0, worst = 0;
  std::printf("%-40s %10s %10s %7s\n", "page", "decode ms", "page ms", "share");
  for (const auto& page : pages) {
    double decode = decodeSeconds(page), whole = pageSeconds(page);
    decodeTotal += decode;
    pageTotal += whole;
    worst = std::max(worst, decode / whole);
    std::printf("%-40s %10.1f %10.1f %6.2f%%\n", page.filename().c_str(), decode * 1e3, whole * 1e3,
                100 * decode / whole);
  }
  std::printf("%zu pages: decoding is %.2f%% of the pages' OCR time (worst page %.2f%%)\n",
              pages.size(), 100 * decodeTotal / pageTotal, 100 * worst);
  return 0;
}
