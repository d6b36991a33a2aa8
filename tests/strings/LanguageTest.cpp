#include <gtest/gtest.h>

#include <atomic>
#include <fstream>
#include <thread>

#include "Corvelbase/Language.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using Language::dominantLanguage;

// The committed evaluation set: one file per language, one sentence a line. Chinese of
// either script is expected as "zh".
const std::pair<const char*, const char*> kEvaluationFiles[] = {
    {"en", "en"}, {"fr", "fr"}, {"de", "de"}, {"it", "it"}, {"pt", "pt"},      {"es", "es"},
    {"ru", "ru"}, {"uk", "uk"}, {"ja", "ja"}, {"ko", "ko"}, {"zh-Hans", "zh"}, {"zh-Hant", "zh"},
};

std::vector<std::string> sentences(const std::string& language) {
  std::ifstream in(testing::fixturePath("language/" + language + ".txt"));
  std::vector<std::string> lines;
  for (std::string line; std::getline(in, line);)
    if (!line.empty()) lines.push_back(line);
  return lines;
}

TEST(DominantLanguage, EvaluationSetIsRecognisedWellInEveryLanguage) {
  int right = 0, total = 0;
  for (const auto& [file, expected] : kEvaluationFiles) {
    std::vector<std::string> lines = sentences(file);
    ASSERT_GE(lines.size(), 20u) << file;
    int rightHere = 0;
    for (const std::string& line : lines) rightHere += dominantLanguage(fromUTF8(line)) == expected;
    EXPECT_GE(rightHere * 100, 85 * static_cast<int>(lines.size())) << file;
    right += rightHere;
    total += static_cast<int>(lines.size());
  }
  EXPECT_GE(right * 100, 95 * total) << right << " of " << total;
}

TEST(DominantLanguage, EdgeCasesHaveDefinedAnswers) {
  const std::pair<std::u16string, std::optional<std::string>> cases[] = {
      {u"", std::nullopt},
      // A script no detector knows: undetermined.
      {u"\U00010000\U00010001\U00010002 \U00010003\U00010004", std::nullopt},  // Linear B
      // Unpaired surrogates are read as replacement characters, not as an error.
      {u"Das ist ein ganz normaler deutscher Satz \xD800 über das Wetter von morgen.", "de"},
  };
  for (const auto& [text, expected] : cases)
    EXPECT_EQ(dominantLanguage(text), expected) << toUTF8(text);
}

TEST(DominantLanguage, LooksOnlyAtTheFirst4096Units) {
  std::u16string english = fromUTF8(sentences("en").front()) + u" ";
  std::u16string russian = fromUTF8(sentences("ru").front()) + u" ";
  // English fills the window; megabytes of Russian after it change nothing.
  std::u16string text;
  while (text.size() < Language::kLanguageDetectionLength) text += english;
  text.resize(Language::kLanguageDetectionLength);
  std::u16string tail;
  while (tail.size() < 2'000'000) tail += russian;
  EXPECT_EQ(dominantLanguage(text + tail), "en");
  // A surrogate pair cut by the window's end is harmless.
  std::u16string cut(Language::kLanguageDetectionLength - 1, u' ');
  EXPECT_EQ(dominantLanguage(cut + u"\U0001F600" + russian), std::nullopt);
}

TEST(DominantLanguage, ManyThreadsAtOnceGetTheSameAnswers) {
  // Texts that reach the shared second detector (one CLD2 leaves to it) and texts that
  // do not, mixed, so the threads contend for its lock.
  std::vector<std::pair<std::u16string, std::optional<std::string>>> work;
  for (const auto& [file, expected] : kEvaluationFiles)
    for (const std::string& line : sentences(file))
      work.emplace_back(fromUTF8(line), dominantLanguage(fromUTF8(line)));
  work.emplace_back(u"1234 5678", std::nullopt);
  std::vector<std::thread> threads;
  std::atomic<int> mismatches{0};
  for (int t = 0; t < 8; ++t) {
    threads.emplace_back([&, t] {
      for (int round = 0; round < 3; ++round)
        for (std::size_t i = t; i < work.size() + t; ++i) {
          const auto& [text, expected] = work[i % work.size()];
          if (dominantLanguage(text) != expected) ++mismatches;
        }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(mismatches.load(), 0);
}

}  // namespace
}  // namespace corvel
