// bench_language: how well and how fast the string utilities detect language and script.
//
// Prints, from the committed evaluation set (tests/fixtures/language):
//   - accuracy of dominantLanguage per language and overall (Chinese of either script is
//     right when the answer is "zh");
//   - throughput of dominantLanguage in MB/s of UTF-8 input, on single sentences and on
//     long documents (of which only the first 4,096 units are read), with their ratio;
//   - the fast East-Asian script scan against the walk over every grapheme cluster, as a
//     ratio of their throughputs on the same texts.
// Each timing repeats its work until at least half a second has passed.
#include <chrono>
#include <cstdio>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "Corvelbase/AsianCharacters.h"
#include "Corvelbase/Language.h"

namespace {

using Clock = std::chrono::steady_clock;

struct LanguageSet {
  const char* file;
  const char* expected;
  std::vector<std::string> sentences;
};

std::vector<std::string> readLines(const std::string& path) {
  std::ifstream in(path);
  std::vector<std::string> lines;
  for (std::string line; std::getline(in, line);)
    if (!line.empty()) lines.push_back(line);
  return lines;
}

// Seconds per pass over `work`, repeated until at least `minimum` seconds have passed.
double secondsPerPass(const std::function<void()>& work, double minimum = 0.5) {
  int passes = 0;
  Clock::time_point start = Clock::now();
  double elapsed = 0;
  do {
    work();
    ++passes;
    elapsed = std::chrono::duration<double>(Clock::now() - start).count();
  } while (elapsed < minimum);
  return elapsed / passes;
}

volatile std::size_t sink = 0;  // keeps the answers alive

}  // namespace

int main() {
  std::vector<LanguageSet> sets = {
      {"en", "en", {}}, {"fr", "fr", {}}, {"de", "de", {}},      {"it", "it", {}},
      {"pt", "pt", {}}, {"es", "es", {}}, {"ru", "ru", {}},      {"uk", "uk", {}},
      {"ja", "ja", {}}, {"ko", "ko", {}}, {"zh-Hans", "zh", {}}, {"zh-Hant", "zh", {}},
  };
  std::vector<corvel::String> texts;
  std::size_t utf8Bytes = 0;
  int right = 0, total = 0;
  std::printf("%-8s %6s %6s %9s\n", "language", "right", "total", "accuracy");
  for (LanguageSet& set : sets) {
    set.sentences = readLines(std::string(CORVEL_FIXTURES_DIR) + "/language/" + set.file + ".txt");
    int rightHere = 0;
    for (const std::string& sentence : set.sentences) {
      corvel::String text = corvel::fromUTF8(sentence);
      rightHere += corvel::Language::dominantLanguage(text) == set.expected ? 1 : 0;
      texts.push_back(std::move(text));
      utf8Bytes += sentence.size();
    }
    int count = static_cast<int>(set.sentences.size());
    std::printf("%-8s %6d %6d %8.1f%%\n", set.file, rightHere, count,
                count ? 100.0 * rightHere / count : 0.0);
    right += rightHere;
    total += count;
  }
  if (total == 0) {
    std::fprintf(stderr, "bench_language: no evaluation set under %s\n", CORVEL_FIXTURES_DIR);
    return 1;
  }
  std::printf("%-8s %6d %6d %8.1f%%\n\n", "overall", right, total, 100.0 * right / total);

  double sentencePass = secondsPerPass([&] {
    for (const corvel::String& text : texts)
      sink = sink + corvel::Language::dominantLanguage(text).value_or("").size();
  });
  double sentenceMBs = utf8Bytes / sentencePass / 1e6;

  // Long documents: every language's sentences joined, repeated to about 1 MB.
  std::vector<corvel::String> documents;
  std::size_t documentBytes = 0, windowBytes = 0;
  for (const LanguageSet& set : sets) {
    std::string joined;
    while (joined.size() < 1'000'000)
      for (const std::string& sentence : set.sentences) joined += sentence + " ";
    documentBytes += joined.size();
    documents.push_back(corvel::fromUTF8(joined));
    windowBytes += corvel::toUTF8(std::u16string_view(documents.back())
                                      .substr(0, corvel::Language::kLanguageDetectionLength))
                       .size();
  }
  double documentPass = secondsPerPass([&] {
    for (const corvel::String& text : documents)
      sink = sink + corvel::Language::dominantLanguage(text).value_or("").size();
  });
  double documentMBs = documentBytes / documentPass / 1e6;
  std::printf("dominantLanguage, %d sentences (%zu bytes): %.2f MB/s\n", total, utf8Bytes,
              sentenceMBs);
  std::printf(
      "dominantLanguage, %zu documents of ~1 MB: %.1f MB/s (%.0fx the sentence rate; "
      "only the first 4096 units are read, at %.2f MB/s)\n\n",
      documents.size(), documentMBs, documentMBs / sentenceMBs, windowBytes / documentPass / 1e6);

  // Script detection: the same sentences, and the same count of ASCII sentences.
  std::vector<corvel::String> ascii;
  for (const LanguageSet& set : sets)
    if (std::string(set.file) == "en")
      for (int copy = 0; copy < 12; ++copy)
        for (const std::string& sentence : set.sentences)
          ascii.push_back(corvel::fromUTF8(sentence));
  for (const auto& [label, corpus] :
       {std::pair{"evaluation set", &texts}, {"English only", &ascii}}) {
    double fast = secondsPerPass([&] {
      for (const corvel::String& text : *corpus)
        sink = sink + corvel::AsianCharacters::containsAsianCharacters(text);
    });
    double walk = secondsPerPass([&] {
      for (const corvel::String& text : *corpus)
        sink = sink + corvel::AsianCharacters::containsAsianCharactersByWalking(text);
    });
    std::printf("containsAsianCharacters on the %s: fast scan %.1fx the grapheme walk\n", label,
                walk / fast);
  }
  return 0;
}
