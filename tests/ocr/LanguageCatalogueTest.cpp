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
  EXPECT_EQ(&catalogue, &RVVisionOCR::allVisionLanguages());  // built once
  for (const auto& row : rows) {
    auto it = catalogue.find(row.key);
    ASSERT_NE(it, catalogue.end()) << row.key;
    const PropertyList& entry = it->second;
    EXPECT_EQ(stringAt(entry, "isoCode"), row.isoCode) << row.key;
    EXPECT_EQ(stringAt(entry, "name"), row.name) << row.key;
    const PropertyList* secondary = entry.find("secondary");
    const PropertyList* forcePrimary = entry.find("forcePrimary");
    if (row.eastAsian) {
      ASSERT_TRUE(secondary && secondary->array()) << row.key;
      ASSERT_EQ(secondary->array()->size(), 1u);
      EXPECT_EQ(secondary->array()->front(), PropertyList(u"en-US"));
      ASSERT_TRUE(forcePrimary);
      EXPECT_EQ(*forcePrimary, PropertyList(true));
    } else {
      EXPECT_FALSE(secondary) << row.key;
      EXPECT_FALSE(forcePrimary) << row.key;
    }
    EXPECT_EQ(entry.dictionary()->size(), row.eastAsian ? 4u : 2u) << row.key;
  }
}

TEST(LanguageCatalogue, CombinationsAreValidOnlyWhenLedByAnEastAsianLanguage) {
  struct Case {
    Codes codes;
    bool valid;
  } cases[] = {
      // valid
      {{}, true},
      {{"ja-JP"}, true},
      {{"ja-JP", "en-US"}, true},
      {{"zh-Hant", "en-US", "zh-Hant"}, true},
      {{"yue-Hans", "en-US"}, true},
      // the first code decides: one without secondary codes makes the list invalid
      {{"en-US"}, false},
      {{"en-US", "ja-JP"}, false},
      {{"fr-FR", "en-US"}, false},
      // East-Asian languages do not mix
      {{"ja-JP", "ko-KR"}, false},
      {{"zh-Hans", "zh-Hant"}, false},
      {{"ja-JP", "fr-FR"}, false},
      // codes outside the catalogue
      {{"xx-XX"}, false},
      {{"ja-JP", "xx-XX"}, false},
      {{"ja-JP", ""}, false},
  };
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
               {{"en-US"}, true},
               {{"zh-Hant"}, true},
               {{"yue-Hans"}, true},
               {{"ja-JP", "ko-KR"}, true},
               {{"zh-Hans"}, false},
               {{"en-US", "zh-Hans"}, false},
               {{"zh-Hant", "zh-Hans", "en-US"}, false}};
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
               {{"ja-JP", "en-US"}, {"ja-JP", "en-US"}},
               {{"xx-XX", "de-DE", "yue-Hant"}, {"yue-Hant", "xx-XX", "de-DE"}},
               {{"xx-XX", "en-US"}, {"xx-XX", "en-US"}}};
  auto job = RVVisionOCR::init();
  for (const auto& c : cases) {
    EXPECT_EQ(job->orderLanguageCodes(c.in), c.out) << ::testing::PrintToString(c.in);
  }
}

class SupportedLanguages : public ::testing::Test {
 protected:
  void SetUp() override { PlatformRegistry::setTextRecognizer(fake_); }
  void TearDown() override {
    PlatformRegistry::setTextRecognizer(nullptr);
    PlatformRegistry::setPlatformVersion({});
  }
  static std::vector<std::string> isoCodes(const std::vector<PropertyList>& entries) {
    std::vector<std::string> codes;
    for (const auto& entry : entries) codes.push_back(stringAt(entry, "isoCode"));
    return codes;
  }
  std::shared_ptr<testing::FakeRecognizer> fake_ = std::make_shared<testing::FakeRecognizer>();
};

TEST_F(SupportedLanguages, FollowTheRecognisersOrderAndSkipCodesOutsideTheCatalogue) {
  fake_->setSupportedLanguages(Codes{"ru-RU", "xx-XX", "yue-Hans", "en-US", "ar-SA"});
  auto entries = RVVisionOCR::supportedLanguages(1);
  ASSERT_TRUE(entries);
  EXPECT_EQ(isoCodes(*entries), (Codes{"ru-RU", "zh-Hans", "en-US"}));
  EXPECT_EQ(stringAt((*entries)[1], "name"), "Cantonese Simplified");
  fake_->setSupportedLanguages(Codes{"xx-XX"});
  entries = RVVisionOCR::supportedLanguages(0);
  ASSERT_TRUE(entries);
  EXPECT_TRUE(entries->empty());
}

TEST_F(SupportedLanguages, AskTheRecogniserTheWayEachPlatformVersionDoes) {
  struct Case {
    PlatformVersion version;
    bool asked;
    std::int64_t revision;
  } cases[] = {{{}, true, 0},
               {{12, 0, 0}, true, 0},
               {{11, 0, 0}, true, 0},
               {{10, 15, 0}, true, 0},
               {{10, 14, 6}, false, 0}};
  for (const auto& c : cases) {
    auto recorder = std::make_shared<testing::FakeRecognizer>();
    PlatformRegistry::setTextRecognizer(recorder);
    PlatformRegistry::setPlatformVersion(c.version);
    auto entries = RVVisionOCR::supportedLanguages(1);
    EXPECT_EQ(entries.has_value(), c.asked) << c.version.major;
    ASSERT_EQ(recorder->supportedQueries().size(), c.asked ? 1u : 0u) << c.version.major;
    if (c.asked) {
      EXPECT_EQ(recorder->supportedQueries()[0].level, 1);
      EXPECT_EQ(recorder->supportedQueries()[0].revision, c.revision);
    }
  }
}

TEST_F(SupportedLanguages, ARecogniserErrorIsLoggedAndGivesNothing) {
  testing::LogCapture log;
  Error error{"test.domain", 5, {}};
  fake_->setSupportedLanguages(std::nullopt, error);
  EXPECT_FALSE(RVVisionOCR::supportedLanguages(0));
  ASSERT_EQ(log.lines().size(), 1u);
  EXPECT_EQ(log.lines()[0], "Error getting Vision Languages: " + error.description());
  // Before 10.15 there is no answer and nothing to log.
  PlatformRegistry::setPlatformVersion({10, 14, 0});
  EXPECT_FALSE(RVVisionOCR::supportedLanguages(0));
  EXPECT_EQ(log.lines().size(), 1u);
}

}  // namespace
}  // namespace corvel
