#include "platform/tesseract/LanguageIdentification.h"

#include <cstdio>  // before CLD2, whose headers use it without including it
#include <limits>
#include <map>

#include <cld2/public/compact_lang_det.h>

namespace corvel::tesseract_backend {

std::string identifyLanguage(const std::string& utf8) {
  static const std::map<std::string, std::string> kCodes = {
      {"en", "en-US"},   {"fr", "fr-FR"},        {"de", "de-DE"}, {"it", "it-IT"},
      {"pt", "pt-BR"},   {"es", "es-ES"},        {"ru", "ru-RU"}, {"uk", "uk-UA"},
      {"zh", "zh-Hans"}, {"zh-Hant", "zh-Hant"}, {"ja", "ja-JP"}, {"ko", "ko-KR"}};
  if (utf8.empty() || utf8.size() > static_cast<std::size_t>(std::numeric_limits<int>::max())) {
    return "";
  }
  bool reliable = false;
  int validPrefix = 0;
  CLD2::Language language = CLD2::DetectLanguageCheckUTF8(
      utf8.data(), static_cast<int>(utf8.size()), true, &reliable, &validPrefix);
  if (!reliable || language == CLD2::UNKNOWN_LANGUAGE) return "";
  auto it = kCodes.find(CLD2::LanguageCode(language));
  return it == kCodes.end() ? "" : it->second;
}

}  // namespace corvel::tesseract_backend
