// The catalogue of recognition languages: display names, valid combinations, fast
// support and the order in which codes reach the recogniser.
#include <algorithm>
#include <mutex>

#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Log.h"
#include "Corvelbase/platform/Platform.h"
#include "platform/RecognitionLanguages.h"

namespace corvel {

const char* const RVVisionLanguageIsoCodeKey = "isoCode";
const char* const RVVisionLanguageNameKey = "name";
const char* const RVVisionLanguageSecondaryKey = "secondary";
const char* const RVVisionLanguageForcePrimaryKey = "forcePrimary";

namespace {

constexpr const char* kSupportedLanguagesLogFormat = "Error getting Vision Languages: %@";
constexpr const char* kEnglish = "en-US";
// Fast recognition is refused for this code (the check is made twice over the same
// code, so Traditional Chinese is never refused).
constexpr const char* kNoFastCode = "zh-Hans";

const PropertyList::Dictionary* entryFor(const std::string& code) {
  const auto& catalogue = RVVisionOCR::allVisionLanguages();
  auto it = catalogue.find(code);
  return it == catalogue.end() ? nullptr : it->second.dictionary();
}

bool hasKey(const PropertyList::Dictionary& entry, const char* key) {
  return entry.find(key) != entry.end();
}

std::string replaceObjectFormat(const std::string& format, const std::string& value) {
  std::string out = format;
  out.replace(out.find("%@"), 2, value);
  return out;
}

}  // namespace

const PropertyList::Dictionary& RVVisionOCR::allVisionLanguages() {
  static std::once_flag once;
  static const PropertyList::Dictionary* catalogue = nullptr;
  std::call_once(once, [] {
    auto* built = new PropertyList::Dictionary;  // lives for the whole process
    for (const auto& row : detail::recognitionLanguages()) {
      PropertyList::Dictionary entry;
      entry[RVVisionLanguageIsoCodeKey] = PropertyList(fromUTF8(row.isoCode));
      entry[RVVisionLanguageNameKey] = PropertyList(fromUTF8(row.name));
      if (row.eastAsian) {
        entry[RVVisionLanguageSecondaryKey] =
            PropertyList(PropertyList::Array{PropertyList(fromUTF8(kEnglish))});
        entry[RVVisionLanguageForcePrimaryKey] = PropertyList(true);
      }
      (*built)[row.code] = PropertyList(std::move(entry));
    }
    catalogue = built;
  });
  return *catalogue;
}

std::optional<std::vector<PropertyList>> RVVisionOCR::supportedLanguages(
    std::int64_t recognitionLevel) {
  PlatformVersion version = PlatformRegistry::platformVersion();
  if (!version.isAtLeast(10, 15)) return std::nullopt;
  Error error;
  std::optional<std::vector<std::string>> codes;
  if (version.isAtLeast(12)) {
    auto request = TextRecognitionRequest::init();
    request->setRecognitionLevel(recognitionLevel);
    codes = request->supportedRecognitionLanguages(&error);
  } else {
    codes = TextRecognitionRequest::supportedRecognitionLanguagesForTextRecognitionLevel(
        recognitionLevel, 0, &error);
  }
  if (!codes) {
    logMessage(replaceObjectFormat(kSupportedLanguagesLogFormat, error.description()));
    return std::nullopt;
  }
  std::vector<PropertyList> entries;
  const auto& catalogue = allVisionLanguages();
  for (const auto& code : *codes) {
    auto it = catalogue.find(code);
    if (it != catalogue.end()) entries.push_back(it->second);
  }
  return entries;
}

bool RVVisionOCR::isLanguageCombinationValid(const LanguageCodes& codes) {
  if (codes.empty()) return true;
  std::vector<std::string> allowed;
  for (const auto& code : codes) {
    const auto* entry = entryFor(code);
    if (!entry) return false;
    if (!allowed.empty()) continue;
    auto secondary = entry->find(RVVisionLanguageSecondaryKey);
    if (secondary == entry->end() || !secondary->second.array()) return false;
    allowed.push_back(code);
    for (const auto& other : *secondary->second.array()) {
      if (const String* s = other.string()) allowed.push_back(toUTF8(*s));
    }
  }
  return std::all_of(codes.begin(), codes.end(), [&](const std::string& code) {
    return std::find(allowed.begin(), allowed.end(), code) != allowed.end();
  });
}

bool RVVisionOCR::supportFastRecognition(const LanguageCodes& codes) {
  auto contains = [&](const char* code) {
    return std::find(codes.begin(), codes.end(), code) != codes.end();
  };
  return !(contains(kNoFastCode) || contains(kNoFastCode));
}

RVVisionOCR::LanguageCodes RVVisionOCR::orderLanguageCodes(const LanguageCodes& codes) const {
  LanguageCodes ordered = codes;
  for (std::size_t i = 0; i < ordered.size(); ++i) {
    const auto* entry = entryFor(ordered[i]);
    if (!entry || !hasKey(*entry, RVVisionLanguageForcePrimaryKey)) continue;
    std::string primary = ordered[i];
    ordered.erase(ordered.begin() + static_cast<std::ptrdiff_t>(i));
    ordered.insert(ordered.begin(), primary);
    break;
  }
  return ordered;
}

}  // namespace corvel
