// libexttextcat in the tagger's role. The only file that sees libexttextcat's headers.
#include <libexttextcat/textcat.h>
#include <unicode/uchar.h>
#include <unicode/utf8.h>

#include <cstdint>
#include <string>

#include "platform/LanguageDetection.h"

namespace corvel::detail {
namespace {

constexpr const char* kConfiguration = "/usr/share/libexttextcat/fpdb.conf";
constexpr const char* kModelDirectory = "/usr/share/libexttextcat/";
// Model ids look like "en--utf8" or "zh-TW-utf8": a code, an optional region or script,
// then the encoding.
constexpr std::string_view kEncodingSuffix = "-utf8";
struct CodeMapping {
  std::string_view textcat;
  std::string_view platform;
};
constexpr CodeMapping kCodeMappings[] = {
    {"zh-CN", "zh-Hans"},
    {"zh-TW", "zh-Hant"},
    {"sh", "sr-Latn"},
};

std::optional<std::string> platformCode(std::string_view id) {
  if (id.ends_with(kEncodingSuffix)) id.remove_suffix(kEncodingSuffix.size());
  for (const CodeMapping& m : kCodeMappings)
    if (id == m.textcat) return std::string(m.platform);
  // Drop the region or script qualifier ("az-cyrillic", "uz-Cyrl", "ha-NG"): the
  // platform names these languages by their code alone.
  std::size_t dash = id.find('-');
  std::string_view code = id.substr(0, dash);
  if (code.empty()) return std::nullopt;
  return std::string(code);
}

// N-gram profiles score digits and punctuation like any other bytes and would name a
// language for "1234 !!!"; without a single letter there is no language to tell.
bool hasLetter(std::string_view utf8) {
  int32_t i = 0;
  const auto length = static_cast<int32_t>(utf8.size());
  while (i < length) {
    UChar32 c = 0;
    U8_NEXT(reinterpret_cast<const uint8_t*>(utf8.data()), i, length, c);
    if (c >= 0 && u_isalpha(c)) return true;
  }
  return false;
}

class TextcatIdentifier final : public LanguageIdentifier {
 public:
  explicit TextcatIdentifier(void* handle) : handle_(handle) {}
  ~TextcatIdentifier() override { textcat_Done(handle_); }
  TextcatIdentifier(const TextcatIdentifier&) = delete;
  TextcatIdentifier& operator=(const TextcatIdentifier&) = delete;

  std::optional<std::string> identify(std::string_view utf8) override {
    if (utf8.empty() || utf8.size() > static_cast<std::size_t>(INT32_MAX) || !hasLetter(utf8))
      return std::nullopt;
    // The answer lives in a buffer of the handle: read it before anyone classifies again.
    const char* answer = textcat_Classify(handle_, utf8.data(), utf8.size());
    if (answer == nullptr || answer[0] != '[') return std::nullopt;  // UNKNOWN or SHORT
    std::string_view list(answer);
    std::size_t close = list.find(']');
    if (close == std::string_view::npos) return std::nullopt;
    return platformCode(list.substr(1, close - 1));
  }

 private:
  void* handle_;
};

}  // namespace

std::unique_ptr<LanguageIdentifier> makeTextcatIdentifier() {
  void* handle = special_textcat_Init(kConfiguration, kModelDirectory);
  if (handle == nullptr) return nullptr;
  return std::make_unique<TextcatIdentifier>(handle);
}

}  // namespace corvel::detail
