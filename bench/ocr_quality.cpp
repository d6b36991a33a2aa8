// bench_ocr_quality: OCR of real pages and of hard kinds of document against the
// `tesseract` command, in one run.
//
// Pages: the OCR corpus (real pages with their true text; --corpus DIR, by default
// ../shared/ocr-corpus beside the source tree) and pages of the kinds real documents
// bring that bench/render_hard.py draws with their true text (forms clean and at 90 dpi,
// receipts scanned and photographed, dark and light slides, colour and grey tables,
// charts, shadowed and photographed pages, court filings, depositions, three-column
// articles, turned pages), rendered into the build folder on the first run (--hard DIR
// for others, --count N pages of each kind, default 2).
//
// Runs, each on the whole batch: the command (2 processes at a time, OMP_THREAD_LIMIT=1,
// -l eng or deu) and our accurate and fast levels (2 pages at a time through the shared
// queue, in the command line's default reading order unless --order says otherwise),
// taking turns chunk by chunk so that all see the same load.
// Prints per kind of page, for each run: mean word recall, precision and order-aware
// word error rate (as the corpus's score.py counts them) and mean seconds per page; then
// pages per minute of each run with our ratio to the command's, and the page where ours
// took longest against the command.
//
// Usage: bench_ocr_quality [--corpus DIR] [--hard DIR] [--count N] [--order rows|engine|layout]
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <map>
#include <string>
#include <thread>
#include <vector>

#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"
#include "bench/TesseractCommand.h"
#include "support/WordScore.h"

namespace {

using namespace corvel;
namespace fs = std::filesystem;

constexpr int kAtOnce = 2;
constexpr std::size_t kChunk = 4;

struct Page {
  std::string image, truth, kind;
  std::string model, code;  // the command's model and our language code
};

// "form_lowres_2" -> "form_lowres"; corpus pages by their first word ("journal").
std::string kindOf(const std::string& name, bool corpus) {
  if (corpus) return "real:" + name.substr(0, name.find('_'));
  std::size_t cut = name.rfind('_');
  return cut == std::string::npos ? name : name.substr(0, cut);
}

void addPages(const fs::path& dir, bool corpus, std::vector<Page>* pages) {
  fs::path images = corpus ? dir / "images" : dir, truths = corpus ? dir / "truth" : dir;
  if (!fs::is_directory(images)) return;
  std::vector<fs::path> files;
  for (const auto& entry : fs::directory_iterator(images)) {
    auto ext = entry.path().extension();
    if (ext == ".png" || ext == ".jpg") files.push_back(entry.path());
  }
  std::sort(files.begin(), files.end());
  for (const auto& file : files) {
    std::string name = file.stem().string();
    fs::path truth = truths / (name + ".txt");
    if (!fs::exists(truth)) continue;
    bool german = name.find("_de_") != std::string::npos;
    pages->push_back({file.string(), bench::readWhole(truth.string()), kindOf(name, corpus),
                      german ? "deu" : "eng", german ? "de-DE" : "en-US"});
  }
}

struct Result {
  std::string text;
  double seconds = 0;
  bool failed = false;
};

// Our jobs, `kAtOnce` in flight at a time so that each page's time is its own.
std::vector<Result> runOurs(const std::vector<Page>& pages, bool fast, RVReadingOrder order,
                            double* batchSeconds) {
  using Clock = std::chrono::steady_clock;
  std::vector<Result> results(pages.size());
  std::vector<Clock::time_point> started(pages.size());
  std::size_t next = 0, finished = 0, inFlight = 0;
  auto start = Clock::now();
  while (finished < pages.size()) {
    while (inFlight < kAtOnce && next < pages.size()) {
      std::size_t i = next++;
      ++inFlight;
      started[i] = Clock::now();
      auto job = RVVisionOCR::init();
      job->setReadingOrder(order);
      job->startOcrImageAtPath(
          fromUTF8(pages[i].image), {pages[i].code}, fast,
          [&, i](const String& text, const std::optional<Error>& error) {
            results[i].text = toUTF8(text);
            results[i].failed = error.has_value();
            results[i].seconds = std::chrono::duration<double>(Clock::now() - started[i]).count();
            ++finished;
            --inFlight;
          });
    }
    std::size_t before = finished;
    MainQueue::runUntil([&] { return finished > before; });
  }
  *batchSeconds = std::chrono::duration<double>(Clock::now() - start).count();
  return results;
}

struct Totals {
  double recall = 0, precision = 0, wer = 0, seconds = 0;
  int pages = 0;
};

void printRow(const std::string& kind, const std::vector<Totals>& runs) {
  std::printf("%-20s", kind.c_str());
  for (const auto& t : runs) {
    double n = std::max(1, t.pages);
    std::printf(" | %5.3f %5.3f %5.3f %6.2f", t.recall / n, t.precision / n, t.wer / n,
                t.seconds / n);
  }
  std::printf("\n");
}

}  // namespace

int main(int argc, char** argv) {
  fs::path source = fs::path(CORVEL_FIXTURES_DIR).parent_path().parent_path();
  fs::path corpus = source.parent_path() / "shared" / "ocr-corpus";
  fs::path hard = fs::current_path() / "ocr-hard-pages";
  int count = 2;
  RVReadingOrder order = RVReadingOrderRows;
  for (int i = 1; i + 1 < argc; i += 2) {
    std::string flag = argv[i], value = argv[i + 1];
    if (flag == "--corpus") corpus = value;
    if (flag == "--hard") hard = value;
    if (flag == "--count") count = std::max(1, std::atoi(value.c_str()));
    if (flag == "--order") {
      order = value == "layout"   ? RVReadingOrderLayoutAnalysis
              : value == "engine" ? RVReadingOrderEngine
                                  : RVReadingOrderRows;
    }
  }
  if (!fs::is_directory(hard) || fs::is_empty(hard)) {
    // Debian's interpreter, which has the python3-pil and python3-numpy the script needs.
    std::string render = "/usr/bin/python3 " + (source / "bench/render_hard.py").string() + " " +
                         hard.string() + " --count " + std::to_string(count);
    std::printf("rendering the hard pages: %s\n", render.c_str());
    std::fflush(stdout);
    if (std::system(render.c_str()) != 0) {
      std::fprintf(stderr, "bench_ocr_quality: rendering the hard pages failed\n");
      return 1;
    }
  }
  std::vector<Page> pages;
  addPages(corpus, true, &pages);
  addPages(hard, false, &pages);
  if (pages.empty() || !bench::tesseractAvailable()) {
    std::fprintf(stderr, "bench_ocr_quality: no pages, or no tesseract command on PATH\n");
    return 1;
  }
  auto recognizer = TesseractRecognizer::init();
  PlatformRegistry::setTextRecognizer(recognizer);
  RVVisionOCR::ocrQueue();  // made on the main thread, as hosts do

  fs::path work = fs::temp_directory_path() / ("bench_ocr_quality." + std::to_string(getpid()));
  fs::create_directories(work);
  std::vector<bench::CommandItem> items;
  for (std::size_t i = 0; i < pages.size(); ++i) {
    items.push_back(
        {pages[i].image, pages[i].model, (work / ("out-" + std::to_string(i))).string()});
  }
  std::printf(
      "bench_ocr_quality: %zu pages, %u cores; %d at a time; command: tesseract -l eng|deu, "
      "OMP_THREAD_LIMIT=1; ours: reading order %lld\n",
      pages.size(), std::thread::hardware_concurrency(), kAtOnce, static_cast<long long>(order));
  std::fflush(stdout);

  // The three runs take turns on small chunks of the batch, so that all three see the
  // same load on the machine; batch times add up over the chunks.
  double commandBatch = 0, accurateBatch = 0, fastBatch = 0;
  std::vector<bench::CommandResult> command;
  std::vector<Result> accurate, fast;
  for (std::size_t first = 0; first < pages.size(); first += kChunk) {
    std::size_t last = std::min(pages.size(), first + kChunk);
    std::vector<bench::CommandItem> chunkItems(items.begin() + first, items.begin() + last);
    std::vector<Page> chunk(pages.begin() + first, pages.begin() + last);
    double seconds = 0;
    for (auto& r : bench::runTesseractBatch(chunkItems, kAtOnce, &seconds)) command.push_back(r);
    commandBatch += seconds;
    for (auto& r : runOurs(chunk, false, order, &seconds)) accurate.push_back(r);
    accurateBatch += seconds;
    for (auto& r : runOurs(chunk, true, order, &seconds)) fast.push_back(r);
    fastBatch += seconds;
  }
  fs::remove_all(work);

  std::map<std::string, std::vector<Totals>> kinds;
  std::vector<Totals> all(3);
  double worst[2] = {0, 0};
  std::string worstPage[2];
  int failures[3] = {0, 0, 0};
  for (std::size_t i = 0; i < pages.size(); ++i) {
    Result runs[3] = {
        {command[i].text, command[i].seconds, command[i].failed}, accurate[i], fast[i]};
    auto& row = kinds[pages[i].kind];
    row.resize(3);
    for (int r = 0; r < 3; ++r) {
      auto score = testing::scoreWords(pages[i].truth, runs[r].text);
      for (Totals* t : {&row[r], &all[r]}) {
        t->recall += score.recall;
        t->precision += score.precision;
        t->wer += score.wer;
        t->seconds += runs[r].seconds;
        ++t->pages;
      }
      if (runs[r].failed) ++failures[r];
      if (r > 0 && runs[0].seconds > 0 && runs[r].seconds / runs[0].seconds > worst[r - 1]) {
        worst[r - 1] = runs[r].seconds / runs[0].seconds;
        worstPage[r - 1] = fs::path(pages[i].image).filename().string();
      }
    }
  }
  std::printf("\n%-20s | %-26s | %-26s | %-26s\n", "", "command", "ours, accurate", "ours, fast");
  std::printf("%-20s", "kind of page");
  for (int r = 0; r < 3; ++r) std::printf(" | recall prec.   wer  s/page");
  std::printf("\n");
  for (const auto& [kind, runs] : kinds) printRow(kind, runs);
  printRow("ALL (mean of pages)", all);

  double n = static_cast<double>(pages.size());
  double commandRate = 60 * n / commandBatch;
  std::printf(
      "\nthroughput: command %.1f pages/min; accurate %.1f pages/min (%.2fx); fast %.1f "
      "pages/min (%.2fx)\n",
      commandRate, 60 * n / accurateBatch, commandBatch / accurateBatch, 60 * n / fastBatch,
      commandBatch / fastBatch);
  std::printf("slowest against the command: accurate %.2fx (%s), fast %.2fx (%s)\n", worst[0],
              worstPage[0].c_str(), worst[1], worstPage[1].c_str());
  std::printf("failed pages: command %d, accurate %d, fast %d\n", failures[0], failures[1],
              failures[2]);
  return 0;
}
