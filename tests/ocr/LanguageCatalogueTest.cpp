// The recognition language catalogue: entries, combinations, fast support, ordering and
// the languages the recogniser supports.
#include <gtest/gtest.h>

#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Platform.h"
#include "support/FakeRecognizer.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using Codes = std::vector<std::string>;

std::string stringAt(const PropertyList& entry, const char* key) {
  const PropertyList* value = entry.find(key);
  return value && value->string() ? toUTF8(*value->string()) : "<none>";
}

TEST(LanguageCatalogue, HasItsFourteenEntriesWithTheirQuirks) {
  struct Row {
    const char* key;
    const char* isoCode;
    const char* name;
    bool eastAsian;
  } rows[] = {{"zh-Hans", "zh-Hans", "Chinese Simplified", true},
              {"zh-Hant", "zh-Hant", "Chinese Traditional", true},
              // Cantonese entries carry the Chinese codes.
              {"yue-Hans", "zh-Hans", "Cantonese Simplified", true},
              {"yue-Hant", "zh-Hant", "Cantonese Traditional", true},
              {"ja-JP", "ja-JP", "Japanese", true},
              {"ko-KR", "ko-KR", "Korean", true},
              {"en-US", "en-US", "English", false},
              {"fr-FR", "fr-FR", "French", false},
              {"de-DE", "de-DE", "German", false},
              {"it-IT", "it-IT", "Italian", false},
              {"pt-BR", "pt-BR", "Portuguese", false},
              {"es-ES", "es-ES", "Spanish", false},
              {"ru-RU", "ru-RU", "Russian", false},
              {"uk-UA", "uk-UA", "Ukranian", false}};  // spelled as hosts know it
  const auto& catalogue = RVVisionOCR::allVisionLanguages();
  EXPECT_EQ(catalogue.size(), 14u);
  for (const auto& row : rows) {
    // East-Asian entries read English as well and must lead the list.
    PropertyList::Dictionary entry{{"isoCode", fromUTF8(row.isoCode)},
                                   {"name", fromUTF8(row.name)}};
    if (row.eastAsian) {
      entry["secondary"] = PropertyList::Array{u"en-US"};
      entry["forcePrimary"] = true;
    }
    auto it = catalogue.find(row.key);
    ASSERT_NE(it, catalogue.end()) << row.key;
    EXPECT_EQ(it->second, PropertyList(entry)) << row.key << ": " << stringAt(it->second, "name");
  }
}

TEST(LanguageCatalogue, CombinationsAreValidOnlyWhenLedByAnEastAsianLanguage) {
  struct Case {
    Codes codes;
    bool valid;
  } cases[] = {// valid, duplicates included
               {{}, true},
               {{"ja-JP"}, true},
               {{"zh-Hant", "en-US", "zh-Hant"}, true},
               {{"yue-Hans", "en-US"}, true},
               // the first code decides: one without secondary codes makes the list invalid
               {{"en-US"}, false},
               {{"en-US", "ja-JP"}, false},
               // East-Asian languages do not mix, nor take other Latin ones
               {{"ja-JP", "ko-KR"}, false},
               {{"ja-JP", "fr-FR"}, false},
               // codes outside the catalogue
               {{"xx-XX"}, false},
               {{"ja-JP", ""}, false}};
  for (const auto& c : cases) {
    EXPECT_EQ(RVVisionOCR::isLanguageCombinationValid(c.codes), c.valid)
        << ::testing::PrintToString(c.codes);
  }
}

TEST(LanguageCatalogue, OnlySimplifiedChineseBlocksFastRecognition) {
  struct Case {
    Codes codes;
    bool fast;
  } cases[] = {{{}, true},
               {{"zh-Hant"}, true},
               {{"yue-Hans"}, true},  // by key, not by the code it carries
               {{"zh-Hans"}, false},
               {{"en-US", "zh-Hans"}, false}};
  for (const auto& c : cases) {
    EXPECT_EQ(RVVisionOCR::supportFastRecognition(c.codes), c.fast)
        << ::testing::PrintToString(c.codes);
  }
}

TEST(LanguageCatalogue, OrderingMovesOnlyTheFirstForcedPrimaryCodeToTheFront) {
  struct Case {
    Codes in;
    Codes out;
  } cases[] = {{{}, {}},
               {{"en-US", "fr-FR"}, {"en-US", "fr-FR"}},
               {{"fr-FR", "ja-JP"}, {"ja-JP", "fr-FR"}},
               {{"en-US", "ko-KR", "ja-JP"}, {"ko-KR", "en-US", "ja-JP"}},
               {{"xx-XX", "de-DE", "yue-Hant"}, {"yue-Hant", "xx-XX", "de-DE"}}};
  auto job = RVVisionOCR::init();
  for (const auto& c : cases) {
    EXPECT_EQ(job->orderLanguageCodes(c.in), c.out) << ::testing::PrintToString(c.in);
  }
}

TEST(SupportedLanguages, FollowTheRecognisersOrderAndAreAskedFromTenFifteenOn) {
  struct Case {
    PlatformVersion version;
    bool asked;
  } cases[] = {{{}, true}, {{10, 15, 0}, true}, {{10, 14, 6}, false}};
  for (const auto& [version, asked] : cases) {
    auto recorder = std::make_shared<testing::FakeRecognizer>();
    recorder->setSupportedLanguages(Codes{"ru-RU", "xx-XX", "yue-Hans", "en-US", "ar-SA"});
    PlatformRegistry::setTextRecognizer(recorder);
    PlatformRegistry::setPlatformVersion(version);
    auto entries = RVVisionOCR::supportedLanguages(1);
    ASSERT_EQ(entries.has_value(), asked) << version.minor;
    ASSERT_EQ(recorder->supportedQueries().size(), asked ? 1u : 0u) << version.minor;
    if (!asked) continue;
    EXPECT_EQ(recorder->supportedQueries()[0].level, 1);
    EXPECT_EQ(recorder->supportedQueries()[0].revision, 0);
    // Codes outside the catalogue are skipped; Cantonese comes back under its own name.
    Codes codes;
    for (const auto& entry : *entries) codes.push_back(stringAt(entry, "isoCode"));
    EXPECT_EQ(codes, (Codes{"ru-RU", "zh-Hans", "en-US"}));
    EXPECT_EQ(stringAt((*entries)[1], "name"), "Cantonese Simplified");
    // None of them known is an empty answer, not none.
    recorder->setSupportedLanguages(Codes{"xx-XX"});
    EXPECT_EQ(RVVisionOCR::supportedLanguages(0), std::vector<PropertyList>{});
  }
  PlatformRegistry::setTextRecognizer(nullptr);
  PlatformRegistry::setPlatformVersion({});
}

TEST(SupportedLanguages, ARecogniserErrorIsLoggedAndGivesNothing) {
  auto failing = std::make_shared<testing::FakeRecognizer>();
  PlatformRegistry::setTextRecognizer(failing);
  testing::LogCapture log;
  Error error{"test.domain", 5, {}};
  failing->setSupportedLanguages(std::nullopt, error);
  EXPECT_FALSE(RVVisionOCR::supportedLanguages(0));
  EXPECT_EQ(log.lines(),
            (std::vector<std::string>{"Error getting Vision Languages: " + error.description()}));
  // Before 10.15 there is no answer and nothing to log.
  PlatformRegistry::setPlatformVersion({10, 14, 0});
  EXPECT_FALSE(RVVisionOCR::supportedLanguages(0));
  EXPECT_EQ(log.lines().size(), 1u);
  PlatformRegistry::setTextRecognizer(nullptr);
  PlatformRegistry::setPlatformVersion({});
}

}  // namespace
}  // namespace corvel
