#include "Corvelbase/Language.h"

#include <algorithm>
#include <mutex>

#include "platform/LanguageDetection.h"

namespace corvel::Language {
namespace {

constexpr std::string_view kChinesePrefix = "zh-";
constexpr std::string_view kChinese = "zh";

std::optional<std::string> fromTagger(std::u16string_view prefix) {
  detail::LinguisticTagger& tagger = detail::LinguisticTagger::shared();
  std::lock_guard lock(tagger.lock());
  tagger.setString(String(prefix));
  std::string code = tagger.dominantLanguage();
  tagger.setString(std::nullopt);
  return code;
}

}  // namespace

std::optional<std::string> dominantLanguage(const String& text) {
  if (text.empty()) return std::nullopt;
  std::u16string_view prefix =
      std::u16string_view(text).substr(0, std::min(text.size(), kLanguageDetectionLength));
  std::optional<std::string> code = detail::bestStringLanguage(prefix);
  if (!code || code->empty()) code = fromTagger(prefix);
  if (!code || code->empty() || *code == detail::kUndeterminedLanguage) return std::nullopt;
  if (code->starts_with(kChinesePrefix)) return std::string(kChinese);
  return code;
}

}  // namespace corvel::Language
