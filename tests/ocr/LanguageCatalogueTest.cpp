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
  const auto& catalogue = RVVisionOCR::allVisionLanguages();
  Codes keys;
  for (const auto& [key, entry] : catalogue) keys.push_back(key);
  std::sort(keys.begin(), keys.end());
  EXPECT_EQ(keys, (Codes{"de-DE", "en-US", "es-ES", "fr-FR", "it-IT", "ja-JP", "ko-KR", "pt-BR",
                         "ru-RU", "uk-UA", "yue-Hans", "yue-Hant", "zh-Hans", "zh-Hant"}));
  struct Row {
    const char* key;
    const char* isoCode;
    const char* name;
    bool eastAsian;
  } rows[] = {{"zh-Hans", "zh-Hans", "Chinese Simplified", true},
              // Cantonese entries carry the Chinese codes.
              {"yue-Hans", "zh-Hans", "Cantonese Simplified", true},
              {"yue-Hant", "zh-Hant", "Cantonese Traditional", true},
              {"ko-KR", "ko-KR", "Korean", true},
              {"en-US", "en-US", "English", false},
              {"uk-UA", "uk-UA", "Ukranian", false}};  // spelled as hosts know it
  for (const auto& row : rows) {
    // East-Asian entries read English as well and must lead the list.
    PropertyList::Dictionary entry{{"isoCode", fromUTF8(row.isoCode)},
                                   {"name", fromUTF8(row.name)}};
    if (row.eastAsian) {
      entry["secondary"] = PropertyList::Array{u"en-US"};
      entry["forcePrimary"] = true;
    }
    EXPECT_EQ(catalogue.at(row.key), PropertyList(entry))
        << row.key << ": " << stringAt(catalogue.at(row.key), "name");
  }
}

TEST(LanguageCatalogue, CombinationsFastSupportAndOrdering) {
  // Valid only when led by a code with secondary codes that all the others belong to.
  struct Combination {
    Codes codes;
    bool valid;
  } combinations[] = {{{}, true},
                      {{"zh-Hant", "en-US", "zh-Hant"}, true},  // duplicates included
                      {{"yue-Hans", "en-US"}, true},
                      {{"en-US"}, false},  // no secondary codes, even alone
                      {{"ja-JP", "ko-KR"}, false},
                      {{"ja-JP", "xx-XX"}, false},
                      {{"xx-XX"}, false}};
  for (const auto& c : combinations)
    EXPECT_EQ(RVVisionOCR::isLanguageCombinationValid(c.codes), c.valid)
        << ::testing::PrintToString(c.codes);
  // Only the simplified Chinese key turns fast recognition off.
  EXPECT_TRUE(RVVisionOCR::supportFastRecognition({}));
  EXPECT_TRUE(RVVisionOCR::supportFastRecognition({"yue-Hans"}));  // by key, not by its code
  EXPECT_FALSE(RVVisionOCR::supportFastRecognition({"en-US", "zh-Hans"}));
  // Only the first forced-primary code moves to the front.
  struct Order {
    Codes in, out;
  } orders[] = {{{}, {}},
                {{"en-US", "fr-FR"}, {"en-US", "fr-FR"}},
                {{"en-US", "ko-KR", "ja-JP"}, {"ko-KR", "en-US", "ja-JP"}},
                {{"xx-XX", "de-DE", "yue-Hant"}, {"yue-Hant", "xx-XX", "de-DE"}}};
  auto job = RVVisionOCR::init();
  for (const auto& c : orders)
    EXPECT_EQ(job->orderLanguageCodes(c.in), c.out) << ::testing::PrintToString(c.in);
}

class SupportedLanguages : public ::testing::Test {
 protected:
  void SetUp() override { PlatformRegistry::setTextRecognizer(recorder_); }
  void TearDown() override {
    PlatformRegistry::setTextRecognizer(nullptr);
    PlatformRegistry::setPlatformVersion({});
  }
  std::shared_ptr<testing::FakeRecognizer> recorder_ = std::make_shared<testing::FakeRecognizer>();
};

TEST_F(SupportedLanguages, FollowTheRecognisersOrderAndAreAskedFromTenFifteenOn) {
  recorder_->setSupportedLanguages(Codes{"ru-RU", "xx-XX", "yue-Hans", "en-US", "ar-SA"});
  PlatformRegistry::setPlatformVersion({10, 14, 6});
  EXPECT_FALSE(RVVisionOCR::supportedLanguages(1));
  EXPECT_TRUE(recorder_->supportedQueries().empty());
  PlatformRegistry::setPlatformVersion({10, 15, 0});
  auto entries = RVVisionOCR::supportedLanguages(1);
  ASSERT_TRUE(entries);
  ASSERT_EQ(recorder_->supportedQueries().size(), 1u);
  EXPECT_EQ(recorder_->supportedQueries()[0].level, 1);
  EXPECT_EQ(recorder_->supportedQueries()[0].revision, 0);
  // Codes outside the catalogue are skipped; Cantonese comes back under its own name.
  Codes codes;
  for (const auto& entry : *entries) codes.push_back(stringAt(entry, "isoCode"));
  EXPECT_EQ(codes, (Codes{"ru-RU", "zh-Hans", "en-US"}));
  EXPECT_EQ(stringAt((*entries)[1], "name"), "Cantonese Simplified");
  // None of them known is an empty answer, not none.
  recorder_->setSupportedLanguages(Codes{"xx-XX"});
  EXPECT_EQ(RVVisionOCR::supportedLanguages(0), std::vector<PropertyList>{});
}

TEST_F(SupportedLanguages, ARecogniserErrorIsLoggedAndGivesNothing) {
  testing::LogCapture log;
  Error error{"test.domain", 5, {}};
  recorder_->setSupportedLanguages(std::nullopt, error);
  EXPECT_FALSE(RVVisionOCR::supportedLanguages(0));
  EXPECT_EQ(log.lines(),
            (std::vector<std::string>{"Error getting Vision Languages: " + error.description()}));
}

}  // namespace
}  // namespace corvel
