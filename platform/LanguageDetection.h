// Language identification behind the two roles the language category relies on
// (internal to the library).
//
// - The tokenizer's role: `bestStringLanguage` answers the best language of a text, or
//   nothing when unsure. Re-entrant.
// - The tagger's role: one shared `LinguisticTagger` that holds a string and answers its
//   dominant language, "und" when it cannot tell. Not re-entrant: callers hold its lock
//   for the whole set-string, read, reset sequence.
//
// Both answer BCP 47 codes as the desktop platform spells them: "en", "fr", "zh-Hans",
// "zh-Hant", "ja", "he" (never the legacy "iw"), ...
#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "Corvelbase/platform/String.h"

namespace corvel::detail {

// One backend: the language of UTF-8 text, or nullopt when it cannot tell. Whether a
// backend is re-entrant is stated at its factory.
class LanguageIdentifier {
 public:
  virtual ~LanguageIdentifier() = default;
  virtual std::optional<std::string> identify(std::string_view utf8) = 0;
};

// CLD2; re-entrant.
std::unique_ptr<LanguageIdentifier> makeCld2Identifier();
// libexttextcat with its installed language models; not re-entrant. nullptr when the
// models cannot be loaded.
std::unique_ptr<LanguageIdentifier> makeTextcatIdentifier();

// CLD2's answer for UTF-8 text only when it calls the answer reliable (for choosing a
// recognition model from a first reading, where a guess would do harm); nullopt
// otherwise and for invalid UTF-8. Re-entrant.
std::optional<std::string> identifyReliably(std::string_view utf8);

// The tokenizer's role (CLD2). Invalid UTF-16 (unpaired surrogates) is read as U+FFFD.
std::optional<std::string> bestStringLanguage(std::u16string_view text);

// The undetermined language code.
inline constexpr std::string_view kUndeterminedLanguage = "und";

class LinguisticTagger {
 public:
  // Created on the first call, exactly once even when threads race to it, and kept for the
  // life of the process.
  static LinguisticTagger& shared();

  explicit LinguisticTagger(std::unique_ptr<LanguageIdentifier> identifier);
  LinguisticTagger(const LinguisticTagger&) = delete;
  LinguisticTagger& operator=(const LinguisticTagger&) = delete;

  // The lock every user holds around setString / dominantLanguage / setString(nullopt).
  std::mutex& lock() { return lock_; }

  void setString(std::optional<String> text) { string_ = std::move(text); }
  // The dominant language of the current string; "und" without a string or an answer.
  std::string dominantLanguage();

 private:
  std::unique_ptr<LanguageIdentifier> identifier_;  // may be null: then always "und"
  std::optional<String> string_;
  std::mutex lock_;
};

}  // namespace corvel::detail
