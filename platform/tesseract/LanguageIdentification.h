// Internal: which of our recognition languages a recognised text is written in.
#pragma once

#include <string>

namespace corvel::tesseract_backend {

// The language code ("de-DE", "ja-JP", ...) of `utf8` when the identification is
// reliable and the language is one we recognise; "" otherwise (also for invalid UTF-8).
std::string identifyLanguage(const std::string& utf8);

}  // namespace corvel::tesseract_backend
