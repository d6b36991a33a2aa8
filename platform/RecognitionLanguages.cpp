#include "platform/RecognitionLanguages.h"

namespace corvel::detail {

namespace {

constexpr RecognitionLanguage kLanguages[] = {
    {"zh-Hans", "zh-Hans", "Chinese Simplified", true, "chi_sim", "zh-Hans", false},
    {"zh-Hant", "zh-Hant", "Chinese Traditional", true, "chi_tra", "zh-Hant", false},
    {"yue-Hans", "zh-Hans", "Cantonese Simplified", true, "chi_sim", "", false},
    {"yue-Hant", "zh-Hant", "Cantonese Traditional", true, "chi_tra", "", false},
    {"ja-JP", "ja-JP", "Japanese", true, "jpn", "ja", false},
    {"ko-KR", "ko-KR", "Korean", true, "kor", "ko", false},
    {"en-US", "en-US", "English", false, "eng", "en", true},
    {"fr-FR", "fr-FR", "French", false, "fra", "fr", true},
    {"de-DE", "de-DE", "German", false, "deu", "de", true},
    {"it-IT", "it-IT", "Italian", false, "ita", "it", true},
    {"pt-BR", "pt-BR", "Portuguese", false, "por", "pt", true},
    {"es-ES", "es-ES", "Spanish", false, "spa", "es", true},
    {"ru-RU", "ru-RU", "Russian", false, "rus", "ru", false},
    {"uk-UA", "uk-UA", "Ukranian", false, "ukr", "uk", false},
};

}  // namespace

std::span<const RecognitionLanguage> recognitionLanguages() { return kLanguages; }

const RecognitionLanguage* recognitionLanguage(std::string_view code) {
  for (const auto& row : kLanguages)
    if (code == row.code) return &row;
  return nullptr;
}

const RecognitionLanguage* recognitionLanguageIdentifiedAs(std::string_view identified) {
  if (identified.empty()) return nullptr;
  for (const auto& row : kLanguages)
    if (identified == row.identified) return &row;
  return nullptr;
}

}  // namespace corvel::detail
