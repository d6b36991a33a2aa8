#include "platform/LanguageDetection.h"

namespace corvel::detail {

std::optional<std::string> bestStringLanguage(std::u16string_view text) {
  // CLD2 keeps no state between calls, so one instance serves every thread.
  static const std::unique_ptr<LanguageIdentifier> cld2 = makeCld2Identifier();
  if (text.empty()) return std::nullopt;
  return cld2->identify(toUTF8(text));
}

LinguisticTagger& LinguisticTagger::shared() {
  // A function-local static is initialised once even under concurrent first calls; never
  // destroyed, so a detached thread may still use it during exit.
  static LinguisticTagger* tagger = new LinguisticTagger(makeTextcatIdentifier());
  return *tagger;
}

LinguisticTagger::LinguisticTagger(std::unique_ptr<LanguageIdentifier> identifier)
    : identifier_(std::move(identifier)) {}

std::string LinguisticTagger::dominantLanguage() {
  if (!identifier_ || !string_ || string_->empty()) return std::string(kUndeterminedLanguage);
  std::optional<std::string> code = identifier_->identify(toUTF8(*string_));
  return code ? *code : std::string(kUndeterminedLanguage);
}

}  // namespace corvel::detail
