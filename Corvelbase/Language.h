// The `Language` category: the dominant language of a text.
#pragma once

#include <optional>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel::Language {

// How many UTF-16 units of a text the detectors look at, from its start.
inline constexpr std::size_t kLanguageDetectionLength = 4096;

// The dominant language of `text` as a language code ("en", "fr", "de", "ru", "ja", "ko",
// ...), or nullopt when the text is empty or no language can be determined.
//
// Only the first 4,096 UTF-16 units are looked at, so megabytes of text cost no more than
// a page. The first detector (CLD2) answers when it can; otherwise a shared second detector
// (libexttextcat), created once for the process and used under its lock, is asked. Chinese
// of either script is reported as "zh" (any answer beginning with "zh-"); "und" becomes
// nullopt. Unpaired surrogates are read as U+FFFD.
//
// Safe to call from any number of threads at once; calls that reach the second detector
// take turns on its lock.
CORVEL_EXPORT std::optional<std::string> dominantLanguage(const String& text);

}  // namespace corvel::Language
