// bench_markdown: every Markdown command on a one-line selection in the middle of texts of
// 10 KB, 1 MB and 100 MB. Prints the time per call for each size and, per command, the
// ratio 100 MB / 10 KB; a command whose cost follows the touched lines rather than the
// document keeps that ratio near 1 (target: at most 2). For contrast, one more row splits
// the whole text into lines, the per-call cost of reading the document line by line.
// Each time is the best of 5 repetitions; Google Benchmark flags are accepted.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdio>
#include <functional>
#include <limits>
#include <map>
#include <random>
#include <string>
#include <vector>

#include "Corvelbase/MarkdownCommands.h"
#include "Corvelbase/platform/Lines.h"

namespace {

namespace md = corvel::MarkdownCommands;
using corvel::Range;
using corvel::String;

struct Document {
  std::string label;
  String text;
  Range selection;  // one whole line (without its terminator) near the middle
};

// Markdown-like lines of varied kinds and lengths, some ending in CR LF, cut to `size` units.
String makeText(std::size_t size, unsigned seed) {
  static const char16_t* const kStarts[] = {
      u"", u"- ", u"1. ", u"## ", u"> ", u"", u"- [ ] ", u"see [a](http://x.org) ", u""};
  static const char16_t kWord[] = u"lorem ipsum dolor sit amet consectetur adipiscing elit ";
  std::mt19937 rng(seed);
  String text;
  text.reserve(size + 200);
  while (text.size() < size) {
    text += kStarts[rng() % std::size(kStarts)];
    std::size_t words = rng() % 12;
    for (std::size_t w = 0; w < words; ++w) text.append(kWord + (rng() % 40), 6);
    text += rng() % 10 == 0 ? u"\r\n" : u"\n";
  }
  text.resize(size);
  return text;
}

// Puts the same line near the middle of every text, so that each size does the same work
// on its selection, and returns that line's range (without its terminator).
constexpr char16_t kMiddleLine[] = u"- [ ] see [a](http://x.org) lorem ipsum dolor sit";

Range placeMiddleLine(String& text) {
  const std::size_t size = text.size();
  std::size_t start = text.rfind(u'\n', size / 2) + 1;
  std::size_t end = text.find(u'\n', start);
  String line = kMiddleLine;
  text.replace(start, end - start, line + u"\n");
  text.resize(size);
  return Range{start, line.size()};
}

using Call = std::function<void(const Document&)>;

std::vector<std::pair<std::string, Call>> commands() {
  using benchmark::DoNotOptimize;
  Range r1, r2;
  return {
      {"linesForRange",
       [](const Document& d) { DoNotOptimize(md::linesForRange(d.text, d.selection)); }},
      {"lineContainsMarkdownLink",
       [=](const Document& d) mutable {
         DoNotOptimize(md::lineContainsMarkdownLink(d.text, d.selection, &r1, &r2));
       }},
      {"insertMarkdownLink",
       [](const Document& d) {
         DoNotOptimize(md::insertMarkdownLink(d.text, u"http://x.org", d.selection));
       }},
      {"headerForLevel", [](const Document& d) { DoNotOptimize(md::headerForLevel(d.text, 3)); }},
      {"setMarkdownHeaderLevel",
       [=](const Document& d) mutable {
         DoNotOptimize(md::setMarkdownHeaderLevel(d.text, 3, d.selection, &r1));
       }},
      {"incrementMarkdownHeader",
       [=](const Document& d) mutable {
         DoNotOptimize(md::incrementMarkdownHeader(d.text, d.selection, &r1));
       }},
      {"insertAtStartOfLine",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertAtStartOfLine(d.text, u"* ", d.selection, false, &r1, &r2));
       }},
      {"insertTaskList",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertTaskList(d.text, d.selection, &r1, &r2));
       }},
      {"insertUnorderedList",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertUnorderedList(d.text, d.selection, &r1, &r2));
       }},
      {"insertQuote",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertQuote(d.text, d.selection, &r1, &r2));
       }},
      {"insertHorizontalLine",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertHorizontalLine(d.text, d.selection, &r1));
       }},
      {"insertNumberedList",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertNumberedList(d.text, d.selection, &r1, &r2));
       }},
      {"containsNumberedList",  // asked of the selected line, as the commands do
       [=](const Document& d) mutable {
         DoNotOptimize(md::containsNumberedList(
             d.text.substr(d.selection.location, d.selection.length), &r1));
       }},
      {"insertInlineCodeBlock",
       [](const Document& d) { DoNotOptimize(md::insertInlineCodeBlock(d.text, d.selection)); }},
      {"insertCodeBlock",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertCodeBlock(d.text, d.selection, &r1));
       }},
      {"insertTable",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertTable(d.text, d.selection, 3, 4, &r1));
       }},
      {"justifyString", [](const Document& d) { DoNotOptimize(md::justifyString(d.text, 1)); }},
      {"insertHTMLJustity",
       [=](const Document& d) mutable {
         DoNotOptimize(md::insertHTMLJustity(d.text, 1, d.selection, &r1));
       }},
  };
}

const char kWholeTextSplit[] = "(split whole text into lines)";

// Keeps the best time per call of every benchmark while printing the usual report.
class BestTimes : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run>& runs) override {
    ConsoleReporter::ReportRuns(runs);
    for (const Run& run : runs) {
      if (run.run_type != Run::RT_Iteration || run.error_occurred) continue;
      double ns = run.real_accumulated_time * 1e9 / static_cast<double>(run.iterations);
      auto [it, fresh] = best_.emplace(run.run_name.function_name, ns);
      if (!fresh) it->second = std::min(it->second, ns);
    }
  }
  double best(const std::string& name) const {
    auto it = best_.find(name);
    return it == best_.end() ? std::numeric_limits<double>::quiet_NaN() : it->second;
  }

 private:
  std::map<std::string, double> best_;
};

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  std::vector<Document> documents;
  for (auto [label, size] :
       {std::pair{"10 KB", std::size_t{10} << 10}, std::pair{"1 MB", std::size_t{1} << 20},
        std::pair{"100 MB", std::size_t{100} << 20}}) {
    String text = makeText(size, 42);
    Range selection = placeMiddleLine(text);
    documents.push_back(Document{label, std::move(text), selection});
  }

  auto list = commands();
  for (const Document& d : documents) {
    for (const auto& [name, call] : list) {
      benchmark::RegisterBenchmark((name + "/" + d.label).c_str(),
                                   [&d, call = call](benchmark::State& state) {
                                     for (auto _ : state) call(d);
                                   })
          ->MinTime(0.05)
          ->Repetitions(5)
          ->ReportAggregatesOnly(false);
    }
    benchmark::RegisterBenchmark((std::string(kWholeTextSplit) + "/" + d.label).c_str(),
                                 [&d](benchmark::State& state) {
                                   for (auto _ : state)
                                     benchmark::DoNotOptimize(corvel::lines(d.text));
                                 })
        ->MinTime(0.05)
        ->Repetitions(2);
  }
  BestTimes reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  benchmark::Shutdown();

  std::printf("\nTime per call (ns, best of repetitions); one-line selection mid-text\n");
  std::printf("%-30s %12s %12s %14s %10s\n", "command", "10 KB", "1 MB", "100 MB", "100MB/10KB");
  list.emplace_back(kWholeTextSplit, Call());
  bool allWithinTarget = true;
  for (const auto& [name, call] : list) {
    double t[3];
    for (std::size_t i = 0; i < 3; ++i) t[i] = reporter.best(name + "/" + documents[i].label);
    double ratio = t[2] / t[0];
    bool reference = name == kWholeTextSplit;
    if (!reference && !(ratio <= 2.0)) allWithinTarget = false;
    std::printf("%-30s %12.0f %12.0f %14.0f %10.2f%s\n", name.c_str(), t[0], t[1], t[2], ratio,
                reference      ? ""
                : ratio <= 2.0 ? ""
                               : "  over target 2");
  }
  std::printf("\nevery command within ratio 2: %s\n", allWithinTarget ? "yes" : "NO");
  return 0;
}
