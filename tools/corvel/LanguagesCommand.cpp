// corvel languages: the recognition language catalogue, with what is installed here.
//
// One line per catalogue entry: its key, its code, its display name, whether the
// recogniser can read it ("installed"), whether fast recognition may be offered for it
// ("fast"), and "first" for the languages that must lead a combination.
#include <cstdio>
#include <iostream>
#include <string>

#include "Corvelbase/RVVisionOCR.h"
#include "tools/corvel/Commands.h"

namespace corvel::tool {

namespace {

std::string field(const PropertyList& entry, const char* key) {
  const PropertyList* value = entry.find(key);
  return value && value->string() ? toUTF8(*value->string()) : "";
}

bool listed(const std::optional<std::vector<PropertyList>>& entries, const std::string& code) {
  if (!entries) return false;
  for (const auto& entry : *entries)
    if (field(entry, RVVisionLanguageIsoCodeKey) == code) return true;
  return false;
}

int run(const Arguments& args) {
  if (!args.empty()) return misuse("languages takes no arguments");
  auto accurate = RVVisionOCR::supportedLanguages(TextRecognitionLevelAccurate);
  auto fast = RVVisionOCR::supportedLanguages(TextRecognitionLevelFast);
  std::printf("%-9s %-8s %-22s %-10s %-5s %s\n", "KEY", "CODE", "NAME", "INSTALLED", "FAST",
              "ORDER");
  for (const auto& [key, entry] : RVVisionOCR::allVisionLanguages()) {
    std::string code = field(entry, RVVisionLanguageIsoCodeKey);
    bool installed = listed(accurate, code);
    bool offersFast = listed(fast, code) && RVVisionOCR::supportFastRecognition({key});
    bool first = entry.find(RVVisionLanguageForcePrimaryKey) != nullptr;
    std::printf("%-9s %-8s %-22s %-10s %-5s %s\n", key.c_str(), code.c_str(),
                field(entry, RVVisionLanguageNameKey).c_str(), installed ? "yes" : "no",
                offersFast ? "yes" : "no", first ? "first" : "");
  }
  if (!accurate) {
    std::cerr << "corvel: no text recogniser is available (no language data installed)\n";
    return 1;
  }
  return 0;
}

CommandRegistration reg("languages",
                        "languages : list the recognition languages, installed and fast ones",
                        &run);

}  // namespace

}  // namespace corvel::tool
