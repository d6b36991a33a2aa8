// Internal: the recognition languages, once for the whole library: the catalogue's
// code, iso code and display name, the engine's model and the code language
// identification gives for the language.
#pragma once

#include <span>
#include <string_view>

namespace corvel::detail {

struct RecognitionLanguage {
  const char* code;     // the code hosts send ("en-US", "yue-Hans")
  const char* isoCode;  // the catalogue's "isoCode": the Cantonese rows carry the Chinese codes
  const char* name;     // the catalogue's "name"; "Ukranian" keeps its spelling, hosts match on it
  bool eastAsian;       // the catalogue's "secondary" ([en-US]) and "forcePrimary"
  const char* model;    // Tesseract's model
  const char* identified;  // what language identification answers for it; "" for none
  bool latin;              // written in the Latin script

  // A row that reads with another row's model under another code (Cantonese).
  bool isAlias() const { return std::string_view(code) != isoCode; }
};

// Every row, in the catalogue's order.
std::span<const RecognitionLanguage> recognitionLanguages();
// The row of a code hosts send, or nullptr.
const RecognitionLanguage* recognitionLanguage(std::string_view code);
// The row language identification's `identified` answer stands for, or nullptr.
const RecognitionLanguage* recognitionLanguageIdentifiedAs(std::string_view identified);

}  // namespace corvel::detail
