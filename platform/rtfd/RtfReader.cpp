#include <unicode/ucnv.h>

#include <algorithm>
#include <array>
#include <map>
#include <new>
#include <string_view>

#include "Corvelbase/platform/RTFD.h"
#include "platform/rtfd/RtfCodec.h"

namespace corvel::detail {

namespace {

constexpr std::size_t kMaxWordLength = 32;  // longer words are nobody's and are skipped
constexpr std::int64_t kMaxParameter = 1'000'000'000'000;
constexpr int kDefaultCodePage = 1252;
constexpr double kTwipsPerPoint = 20.0;

enum class Destination { Text, Skip, Graphic };

struct Group {
  Destination destination = Destination::Text;
  int unicodeSkip = 1;              // \ucN: fallback characters after each \uN
  bool swallowPlaceholder = false;  // the character after an attachment's graphic group
  bool graphicRoot = false;         // this group began the \NeXTGraphic being read
};

bool isLetter(std::uint8_t c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z'); }
bool isDigit(std::uint8_t c) { return c >= '0' && c <= '9'; }
int hexValue(std::uint8_t c) {
  if (isDigit(c)) return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

bool isSkippedDestination(std::string_view word) {
  static constexpr std::array<std::string_view, 27> kWords = {
      "fonttbl",      "colortbl",  "stylesheet",      "info",     "pict",      "object",
      "header",       "headerl",   "headerr",         "headerf",  "footer",    "footerl",
      "footerr",      "footerf",   "footnote",        "fldinst",  "listtable", "listoverridetable",
      "listtext",     "rsidtbl",   "generator",       "xmlnstbl", "themedata", "colorschememapping",
      "latentstyles", "datastore", "expandedcolortbl"};
  return std::find(kWords.begin(), kWords.end(), word) != kWords.end();
}

// Characters that a control word stands for.
std::optional<char16_t> characterForWord(std::string_view word) {
  static const std::map<std::string_view, char16_t> kCharacters = {
      {"par", u'\n'},           {"sect", u'\n'},        {"row", u'\n'},
      {"line", u'\u2028'},      {"tab", u'\t'},         {"cell", u'\t'},
      {"page", u'\f'},          {"emdash", u'\u2014'},  {"endash", u'\u2013'},
      {"lquote", u'\u2018'},    {"rquote", u'\u2019'},  {"ldblquote", u'\u201C'},
      {"rdblquote", u'\u201D'}, {"bullet", u'\u2022'},  {"enspace", u'\u2002'},
      {"emspace", u'\u2003'},   {"qmspace", u'\u2005'}, {"zwj", u'\u200D'},
      {"zwnj", u'\u200C'},      {"ltrmark", u'\u200E'}, {"rtlmark", u'\u200F'}};
  auto it = kCharacters.find(word);
  if (it == kCharacters.end()) return std::nullopt;
  return it->second;
}

// Decodes 8-bit text in a Windows or Mac code page with ICU; converters are opened once
// per parse.
class CodePages {
 public:
  ~CodePages() {
    for (auto& [page, converter] : converters_)
      if (converter) ucnv_close(converter);
  }
  String decode(int page, const std::string& bytes) {
    UConverter* converter = converterFor(page);
    if (!converter) converter = converterFor(kDefaultCodePage);
    if (!converter) return fromUTF8(bytes);
    String out(bytes.size() * 2 + 1, u'\0');
    UErrorCode status = U_ZERO_ERROR;
    int32_t n = ucnv_toUChars(converter, reinterpret_cast<UChar*>(out.data()),
                              static_cast<int32_t>(out.size()), bytes.data(),
                              static_cast<int32_t>(bytes.size()), &status);
    if (U_FAILURE(status)) return String(bytes.size(), u'\uFFFD');
    out.resize(static_cast<std::size_t>(n));
    return out;
  }

 private:
  UConverter* converterFor(int page) {
    auto it = converters_.find(page);
    if (it != converters_.end()) return it->second;
    std::string name = page == 10000 ? "macintosh" : "cp" + std::to_string(page);
    UErrorCode status = U_ZERO_ERROR;
    UConverter* converter = ucnv_open(name.c_str(), &status);
    if (U_FAILURE(status)) converter = nullptr;
    converters_[page] = converter;
    return converter;
  }
  std::map<int, UConverter*> converters_;
};

class Parser {
 public:
  Parser(const std::uint8_t* bytes, std::size_t size, const AttachmentResolver& resolver)
      : p_(bytes), n_(size), resolver_(resolver) {}

  // The text, or nullopt when groups nest deeper than kMaxRTFGroupDepth.
  std::optional<AttributedString> run(std::size_t start) {
    pos_ = start;
    while (pos_ < n_ && !done_) {
      std::uint8_t c = p_[pos_++];
      if (c == '{') {
        openGroup();
      } else if (c == '}') {
        closeGroup();
      } else if (c == '\\') {
        control();
      } else if (c != '\r' && c != '\n') {
        textByte(c);
      }
    }
    if (tooDeep_) return std::nullopt;
    flushBytes();  // a truncated document keeps what was read; an open graphic is dropped
    return build();
  }

 private:
  Group& top() { return stack_.back(); }

  void openGroup() {
    flushBytes();
    pendingSkip_ = 0;
    if (stack_.size() >= kMaxRTFGroupDepth) {
      tooDeep_ = done_ = true;
      return;
    }
    Group child = stack_.empty() ? Group{} : top();
    child.swallowPlaceholder = false;
    child.graphicRoot = false;
    stack_.push_back(child);
  }

  void closeGroup() {
    flushBytes();
    pendingSkip_ = 0;
    if (stack_.empty()) return;
    if (top().graphicRoot) finishGraphic();
    stack_.pop_back();
    if (stack_.empty()) done_ = true;  // the document group closed; the rest is not ours
  }

  // Counts a character against the fallback of the last \uN; true when it is skipped.
  bool skipFallback() {
    if (pendingSkip_ == 0) return false;
    --pendingSkip_;
    return true;
  }

  void textByte(std::uint8_t c) {
    if (stack_.empty() || skipFallback()) return;
    if (top().destination != Destination::Skip) bytes_ += static_cast<char>(c);
  }

  void flushBytes() {
    if (bytes_.empty()) return;
    if (!stack_.empty()) {
      if (top().destination == Destination::Graphic)
        graphicName_ += fromUTF8(bytes_);  // names are UTF-8 whatever the code page
      else if (top().destination == Destination::Text)
        for (char16_t unit : codePages_.decode(codePage_, bytes_)) emit(unit);
    }
    bytes_.clear();
  }

  void emit(char16_t unit) {
    if (stack_.empty()) return;
    Group& group = top();
    if (group.destination == Destination::Graphic) {
      graphicName_ += unit;
    } else if (group.destination == Destination::Text) {
      if (group.swallowPlaceholder) {
        group.swallowPlaceholder = false;
        return;
      }
      text_ += unit;
    }
  }

  void control() {
    if (pos_ >= n_) return;
    std::uint8_t c = p_[pos_];
    if (isLetter(c)) return controlWord();
    ++pos_;
    if (c == '\'') {
      int high = pos_ < n_ ? hexValue(p_[pos_]) : -1;
      int low = pos_ + 1 < n_ ? hexValue(p_[pos_ + 1]) : -1;
      if (high < 0) return;  // not an escape: what follows is text
      if (low < 0) {
        ++pos_;  // a cut escape goes with its one digit
        return;
      }
      pos_ += 2;
      textByte(static_cast<std::uint8_t>(high * 16 + low));
      return;
    }
    if (c == '\\' || c == '{' || c == '}') return textByte(c);
    flushBytes();
    if (stack_.empty() || skipFallback()) return;
    switch (c) {
      case '*':
        top().destination = Destination::Skip;
        break;
      case '~':
        emit(u'\u00A0');
        break;
      case '_':
        emit(u'\u2011');
        break;
      case '\n':
      case '\r':
        emit(u'\n');
        break;
      default:
        break;  // \- (optional hyphen), \| , \: and unknown symbols
    }
  }

  void controlWord() {
    std::size_t start = pos_;
    // Hostile documents carry words of any length: keep this scan tight.
    const std::uint8_t* q = p_ + pos_;
    const std::uint8_t* end = p_ + n_;
    while (q < end && static_cast<unsigned>((*q | 0x20) - 'a') < 26u) ++q;
    pos_ = static_cast<std::size_t>(q - p_);
    std::size_t length = pos_ - start;
    std::string_view word(reinterpret_cast<const char*>(p_ + start),
                          length <= kMaxWordLength ? length : 0);
    bool negative = false, hasParameter = false;
    std::int64_t parameter = 0;
    if (pos_ < n_ && p_[pos_] == '-' && pos_ + 1 < n_ && isDigit(p_[pos_ + 1])) {
      negative = true;
      ++pos_;
    }
    while (pos_ < n_ && isDigit(p_[pos_])) {
      hasParameter = true;
      parameter = std::min(kMaxParameter, parameter * 10 + (p_[pos_] - '0'));
      ++pos_;
    }
    if (negative) parameter = -parameter;
    if (pos_ < n_ && p_[pos_] == ' ') ++pos_;
    if (word == "bin") return skipBinary(hasParameter ? parameter : 0);
    flushBytes();
    if (stack_.empty() || skipFallback()) return;
    apply(word, hasParameter, parameter);
  }

  void skipBinary(std::int64_t count) {
    if (count > 0) pos_ += static_cast<std::size_t>(std::min<std::int64_t>(count, n_ - pos_));
  }

  void apply(std::string_view word, bool hasParameter, std::int64_t parameter) {
    Group& group = top();
    if (word == "u") {
      if (hasParameter && parameter >= -32768 && parameter <= 0x10FFFF) {
        std::int64_t value = parameter < 0 ? parameter + 0x10000 : parameter;
        if (value > 0xFFFF) {  // a whole code point, as some writers put it
          value -= 0x10000;
          emit(static_cast<char16_t>(0xD800 + (value >> 10)));
          emit(static_cast<char16_t>(0xDC00 + (value & 0x3FF)));
        } else {
          emit(static_cast<char16_t>(value));
        }
      }
      pendingSkip_ = group.unicodeSkip;
    } else if (word == "uc") {
      if (hasParameter)
        group.unicodeSkip = static_cast<int>(std::clamp<std::int64_t>(parameter, 0, 16));
    } else if (word == "NeXTGraphic") {
      if (group.destination == Destination::Text && !graphicOpen_) {
        group.destination = Destination::Graphic;
        group.graphicRoot = true;
        graphicOpen_ = true;
        graphicName_.clear();
        width_ = height_ = 0;
      }
    } else if (group.destination == Destination::Graphic && (word == "width" || word == "height")) {
      (word == "width" ? width_ : height_) = hasParameter ? parameter : 0;
    } else if (word == "ansicpg") {
      if (hasParameter && parameter > 0 && parameter < 100000)
        codePage_ = static_cast<int>(parameter);
    } else if (word == "ansi") {
      codePage_ = 1252;
    } else if (word == "mac") {
      codePage_ = 10000;
    } else if (word == "pc") {
      codePage_ = 437;
    } else if (word == "pca") {
      codePage_ = 850;
    } else if (isSkippedDestination(word)) {
      group.destination = Destination::Skip;
    } else if (auto character = characterForWord(word)) {
      emit(*character);
    }
  }

  void finishGraphic() {
    graphicOpen_ = false;
    std::string name = toUTF8(graphicName_);
    auto first = name.find_first_not_of(" \t");
    auto last = name.find_last_not_of(" \t");
    name = first == std::string::npos ? "" : name.substr(first, last - first + 1);
    if (stack_.size() < 2) return;  // the document group itself is no graphic's group
    std::size_t parent = stack_.size() - 2;
    if (stack_[parent].destination != Destination::Text) return;
    AttachmentReference reference{name, std::nullopt};
    if (width_ > 0 && height_ > 0)
      reference.size = Size{width_ / kTwipsPerPoint, height_ / kTwipsPerPoint};
    attachments_.push_back({text_.size(), resolver_(reference)});
    text_ += AttachmentCharacter;
    // The outer group of the construct ends with one placeholder character.
    if (parent > 0) stack_[parent].swallowPlaceholder = true;
  }

  AttributedString build() {
    AttributedString result;
    result.beginEditing();
    std::size_t from = 0;
    for (const auto& [at, attachment] : attachments_) {
      if (at > from) result.appendAttributedString(AttributedString(text_.substr(from, at - from)));
      result.appendAttributedString(AttributedString::attributedStringWithAttachment(attachment));
      from = at + 1;
    }
    if (from < text_.size()) result.appendAttributedString(AttributedString(text_.substr(from)));
    result.endEditing();
    return result;
  }

  const std::uint8_t* p_;
  std::size_t n_;
  std::size_t pos_ = 0;
  const AttachmentResolver& resolver_;
  std::vector<Group> stack_;
  bool tooDeep_ = false;
  bool done_ = false;
  int pendingSkip_ = 0;
  std::string bytes_;
  int codePage_ = kDefaultCodePage;
  CodePages codePages_;
  String text_;
  std::vector<std::pair<std::size_t, std::shared_ptr<TextAttachment>>> attachments_;
  bool graphicOpen_ = false;
  String graphicName_;
  std::int64_t width_ = 0, height_ = 0;
};

}  // namespace

std::optional<AttributedString> readRTF(const std::uint8_t* bytes, std::size_t size,
                                        const AttachmentResolver& resolver) {
  std::size_t start = 0;
  while (start < size && (bytes[start] == ' ' || bytes[start] == '\t' || bytes[start] == '\r' ||
                          bytes[start] == '\n'))
    ++start;
  constexpr std::string_view kMagic = "{\\rtf";
  if (size - start < kMagic.size() ||
      std::string_view(reinterpret_cast<const char*>(bytes + start), kMagic.size()) != kMagic)
    return std::nullopt;
  try {
    return Parser(bytes, size, resolver).run(start);
  } catch (const std::bad_alloc&) {
    return std::nullopt;
  }
}

}  // namespace corvel::detail
