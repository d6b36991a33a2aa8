// CLD2: the tokenizer's role, and the recogniser's choice of a model from a first
// reading. The only file that sees CLD2's headers.
#include <cstdio>  // CLD2's headers use FILE without including it
// (keep the order)
#include <cld2/public/compact_lang_det.h>
#include <cld2/public/encodings.h>

#include <climits>
#include <vector>

#include "platform/LanguageDetection.h"

namespace corvel::detail {
namespace {

// CLD2's unknown marker and the legacy codes it still uses, with the codes the desktop
// platform gives for the same languages.
constexpr std::string_view kUnknown = "un";
struct CodeMapping {
  std::string_view cld2;
  std::string_view platform;
};
constexpr CodeMapping kCodeMappings[] = {
    {"zh", "zh-Hans"}, {"iw", "he"}, {"jw", "jv"}, {"no", "nb"}, {"tl", "fil"}, {"in", "id"},
};
// Extended results name a script rather than a language ("xx-Kana"): no answer.
constexpr std::string_view kScriptOnlyPrefix = "xx-";

// CLD2's answer in the platform's spelling, and whether CLD2 calls it reliable.
std::optional<std::string> identifyWithCld2(std::string_view utf8, bool* reliableAnswer) {
  *reliableAnswer = false;
  if (utf8.empty() || utf8.size() > static_cast<std::size_t>(INT_MAX)) return std::nullopt;
  CLD2::CLDHints hints{nullptr, nullptr, CLD2::UNKNOWN_ENCODING, CLD2::UNKNOWN_LANGUAGE};
  CLD2::Language language3[3];
  int percent3[3];
  double scores3[3];
  int textBytes = 0;
  bool reliable = false;
  int validPrefix = 0;
  // The checking variant: it refuses malformed UTF-8 instead of reading past it.
  CLD2::Language found = CLD2::ExtDetectLanguageSummaryCheckUTF8(
      utf8.data(), static_cast<int>(utf8.size()), true, &hints, 0, language3, percent3, scores3,
      nullptr, &textBytes, &reliable, &validPrefix);
  *reliableAnswer = reliable;
  if (found == CLD2::UNKNOWN_LANGUAGE) return std::nullopt;
  std::string_view code = CLD2::LanguageCode(found);
  if (code.empty() || code == kUnknown || code.starts_with(kScriptOnlyPrefix)) return std::nullopt;
  for (const CodeMapping& m : kCodeMappings)
    if (code == m.cld2) return std::string(m.platform);
  return std::string(code);
}

class Cld2Identifier final : public LanguageIdentifier {
 public:
  std::optional<std::string> identify(std::string_view utf8) override {
    bool reliable = false;
    return identifyWithCld2(utf8, &reliable);
  }
};

}  // namespace

std::optional<std::string> identifyReliably(std::string_view utf8) {
  bool reliable = false;
  auto answer = identifyWithCld2(utf8, &reliable);
  return reliable ? answer : std::nullopt;
}

std::unique_ptr<LanguageIdentifier> makeCld2Identifier() {
  return std::make_unique<Cld2Identifier>();
}

}  // namespace corvel::detail
