// bench_documents: documents in, searchable PDFs out, against what users run today, in
// one run on the same files.
//
// 1. A 20-page scanned PDF (the ten A4 pages of tests/fixtures/ocr/pages, then the same
//    ten a little skewed, blurred and grainy, as a scanner gives them; 300 dpi JPEG
//    pictures, made with Pillow) made searchable by `ocrmypdf --output-type pdf` (its
//    default jobs: one per core) and by `corvel ocr -o OUT.pdf` at both levels, each twice
//    in turn, the faster run kept: pages per minute, output size, and the share of the pages'
//    source words that pdftotext finds in each output.
// 2. The same pages as a 20-page bilevel TIFF (Group 4) read by `corvel ocr`, against the
//    `tesseract` command on each page's own TIFF, two processes at a time (its best way):
//    pages per minute and word recall.
// 3. Peak memory (maximum resident set) of `corvel ocr -o OUT.pdf` on a 100-page PDF next
//    to a 10-page one (the pages repeated).
// Every ratio compares figures measured here, in this run. Usage: bench_documents
// [--skip-memory]. Needs python3 with Pillow, poppler-utils; ocrmypdf and tesseract are
// measured when they are on PATH.
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "bench/TesseractCommand.h"

namespace {

namespace fs = std::filesystem;
using corvel::bench::readWhole;

constexpr int kPages = 20;
constexpr int kRounds = 2;

struct Run {
  bool ok = false;
  double seconds = 0;
  double peakMegabytes = 0;
};

// Runs `command` through the shell; its wall time and the peak memory of its largest
// process (children included, as wait4 reports them).
Run timed(const std::string& command) {
  auto start = std::chrono::steady_clock::now();
  pid_t pid = fork();
  if (pid == 0) {
    execl("/bin/sh", "sh", "-c", command.c_str(), static_cast<char*>(nullptr));
    _exit(127);
  }
  int status = 0;
  struct rusage usage {};
  wait4(pid, &status, 0, &usage);
  Run run;
  run.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
  run.ok = WIFEXITED(status) && WEXITSTATUS(status) == 0;
  run.peakMegabytes = static_cast<double>(std::max(usage.ru_maxrss, 0L)) / 1024.0;
  return run;
}

bool onPath(const std::string& program) {
  return std::system(("command -v " + program + " >/dev/null 2>&1").c_str()) == 0;
}

std::vector<std::string> words(const std::string& text) {
  std::vector<std::string> out;
  std::string word;
  for (char c : text + " ") {
    if (std::isalnum(static_cast<unsigned char>(c))) {
      word += static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    } else if (!word.empty()) {
      out.push_back(word);
      word.clear();
    }
  }
  return out;
}

// The share of the truth's words (as a multiset) found in `text`.
double recall(const std::string& truth, const std::string& text) {
  std::map<std::string, int> found;
  for (const auto& w : words(text)) ++found[w];
  std::size_t total = 0, hit = 0;
  for (const auto& w : words(truth)) {
    ++total;
    if (found[w] > 0) --found[w], ++hit;
  }
  return total ? static_cast<double>(hit) / static_cast<double>(total) : 0;
}

double megabytes(const std::string& path) {
  std::error_code error;
  auto size = fs::file_size(path, error);
  return error ? 0 : static_cast<double>(size) / 1e6;
}

void row(const char* what, double pagesPerMinute, double sizeMB, double wordRecall) {
  std::printf("  %-28s %8.1f pages/min  %7.2f MB  word recall %5.1f%%\n", what, pagesPerMinute,
              sizeMB, 100 * wordRecall);
}

}  // namespace

int main(int argc, char** argv) {
  bool skipMemory = argc > 1 && std::string(argv[1]) == "--skip-memory";
  fs::path work = fs::temp_directory_path() / ("bench_documents." + std::to_string(getpid()));
  fs::create_directories(work);
  std::string pages = std::string(CORVEL_FIXTURES_DIR) + "/ocr/pages";
  std::string corvel = CORVEL_TOOL_PATH;
  std::string truth;
  for (int i = 0; i < kPages; ++i) {  // the ten source pages, twice
    char name[32];
    std::snprintf(name, sizeof name, "/page-%02d.txt", i % 10 + 1);
    truth += readWhole(pages + name) + "\n";
  }

  // The documents, made by Pillow from the fixture pages.
  std::string script = R"PY(
import sys
from PIL import Image
pages, work, count = sys.argv[1], sys.argv[2], int(sys.argv[3])
import random
from PIL import ImageFilter
sources = [Image.open("%s/page-%02d.png" % (pages, i)).convert("L") for i in range(1, 11)]
# The second ten are the first ten as a scanner gives them back: a little skewed, a little
# blurred, with grain.
random.seed(7)
def scanned(page):
    turned = page.rotate(random.uniform(-0.8, 0.8), resample=Image.BICUBIC, fillcolor=255)
    grain = Image.effect_noise(page.size, 18).point(lambda v: v - 128)
    blurred = turned.filter(ImageFilter.GaussianBlur(0.6))
    return Image.eval(Image.blend(blurred, Image.merge("L", [grain]), 0.08), lambda v: min(255, v + 10))
grey = (sources + [scanned(p) for p in sources])[:count]
grey[0].save(work + "/scan20.pdf", save_all=True, append_images=grey[1:], resolution=300, quality=75)
grey[0].save(work + "/scan10.pdf", save_all=True, append_images=grey[1:10], resolution=300, quality=75)
grey[0].save(work + "/scan100.pdf", save_all=True, append_images=(grey * 5)[1:], resolution=300, quality=75)
bilevel = [g.point(lambda v: 255 if v > 160 else 0).convert("1") for g in grey]
bilevel[0].save(work + "/scan20.tif", save_all=True, append_images=bilevel[1:], compression="group4", dpi=(300, 300))
for i, b in enumerate(bilevel):
    b.save("%s/page-%02d.tif" % (work, i + 1), compression="group4", dpi=(300, 300))
)PY";
  std::ofstream(work / "make.py") << script;
  if (std::system(("/usr/bin/python3 " + (work / "make.py").string() + " " + pages + " " +
                   work.string() + " " + std::to_string(kPages))
                      .c_str()) != 0) {
    std::fprintf(stderr, "bench_documents: cannot make the documents (python3 with Pillow)\n");
    fs::remove_all(work);
    return 1;
  }
  std::string w = work.string();
  std::printf("bench_documents: %d A4 pages at 300 dpi (scanned PDF %.1f MB, TIFF %.1f MB)\n\n",
              kPages, megabytes(w + "/scan20.pdf"), megabytes(w + "/scan20.tif"));

  // 1. Searchable PDFs: each program twice, taking turns, and the faster of its two runs
  //    kept, so that a burst of load from elsewhere on the machine falls on one run of
  //    one of them rather than decides the ratio.
  std::printf("searchable PDF from the scanned PDF (faster of %d runs each, taking turns):\n",
              kRounds);
  bool haveTheirs = onPath("ocrmypdf");
  // Ours at both levels (the fast one reads the page reduced to a long side of 2200
  // pixels, about 190 dpi for A4), then OCRmyPDF.
  struct Contender {
    const char* label;
    std::string command, output;
    Run best{};
  };
  std::vector<Contender> contenders = {
      {"corvel ocr -o OUT.pdf", corvel + " ocr --lang en " + w + "/scan20.pdf -o ", "corvel"},
      {"corvel ocr --fast -o OUT.pdf", corvel + " ocr --fast --lang en " + w + "/scan20.pdf -o ",
       "corvel-fast"}};
  if (haveTheirs) {
    contenders.push_back({"ocrmypdf --output-type pdf",
                          "ocrmypdf --output-type pdf -l eng -q " + w + "/scan20.pdf ",
                          "ocrmypdf"});
  }
  for (int round = 0; round < kRounds; ++round) {
    for (auto& c : contenders) {
      Run run = timed(c.command + w + "/" + c.output + ".pdf 2>/dev/null");
      if (round == 0 || (run.ok && (!c.best.ok || run.seconds < c.best.seconds))) c.best = run;
    }
  }
  struct Figures {
    double rate, size, recall;
  };
  std::vector<Figures> figures;
  for (auto& c : contenders) {
    std::string pdf = w + "/" + c.output + ".pdf", text = w + "/" + c.output + ".txt";
    std::system(("pdftotext " + pdf + " " + text).c_str());
    figures.push_back({c.best.ok ? kPages * 60.0 / c.best.seconds : 0, megabytes(pdf),
                       recall(truth, readWhole(text))});
    row(c.label, figures.back().rate, figures.back().size, figures.back().recall);
  }
  if (!haveTheirs) {
    std::printf("  (ocrmypdf is not installed: no comparison)\n");
  } else if (!contenders.back().best.ok) {
    std::printf("  (ocrmypdf failed)\n");
  } else {
    const Figures& theirs = figures.back();
    for (std::size_t i = 0; i + 1 < contenders.size(); ++i) {
      if (!contenders[i].best.ok) continue;
      std::printf("  ratio %s/ocrmypdf: throughput %.2fx, size %.2fx, word recall %+.1f points\n",
                  i == 0 ? "corvel" : "corvel --fast", figures[i].rate / theirs.rate,
                  figures[i].size / theirs.size, 100 * (figures[i].recall - theirs.recall));
    }
  }

  // 2. A multi-page TIFF against the command page by page.
  std::printf("\n20-page TIFF:\n");
  Run tiff =
      timed(corvel + " ocr --lang en " + w + "/scan20.tif -o " + w + "/tiff.txt 2>/dev/null");
  double tiffRate = tiff.ok ? kPages * 60.0 / tiff.seconds : 0;
  row("corvel ocr FILE.tif", tiffRate, 0, recall(truth, readWhole(w + "/tiff.txt")));
  if (corvel::bench::tesseractAvailable()) {
    std::vector<corvel::bench::CommandItem> items;
    for (int i = 1; i <= kPages; ++i) {
      char name[32];
      std::snprintf(name, sizeof name, "/page-%02d", i);
      items.push_back({w + name + ".tif", "eng", w + name + "-tesseract"});
    }
    double seconds = 0;
    auto results = corvel::bench::runTesseractBatch(items, 2, &seconds);
    std::string text;
    for (const auto& r : results) text += r.text + "\n";
    double rate = kPages * 60.0 / seconds;
    row("tesseract PAGE.tif (2 at once)", rate, 0, recall(truth, text));
    std::printf("  ratio corvel/tesseract: throughput %.2fx\n", tiffRate / rate);
  }

  // 3. Memory against the page count.
  if (!skipMemory) {
    std::printf("\npeak memory of corvel ocr -o OUT.pdf:\n");
    Run ten =
        timed(corvel + " ocr --lang en " + w + "/scan10.pdf -o " + w + "/ten.pdf 2>/dev/null");
    Run hundred =
        timed(corvel + " ocr --lang en " + w + "/scan100.pdf -o " + w + "/hundred.pdf 2>/dev/null");
    std::printf("  10 pages: %.0f MB (%.0f s)   100 pages: %.0f MB (%.0f s)   ratio %.2fx\n",
                ten.peakMegabytes, ten.seconds, hundred.peakMegabytes, hundred.seconds,
                hundred.peakMegabytes / std::max(ten.peakMegabytes, 1.0));
    if (!ten.ok || !hundred.ok) std::printf("  (a run failed)\n");
  }
  fs::remove_all(work);
  return contenders.front().best.ok && tiff.ok ? 0 : 1;
}
