#include "platform/PlistShape.h"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstring>
#include <limits>
#include <optional>
#include <string_view>
#include <unordered_map>

namespace corvel {

namespace {

constexpr std::size_t kHeaderSize = 8;  // "bplist00"
constexpr std::size_t kTrailerSize = 32;

std::uint64_t bigEndian(const std::uint8_t* p, std::size_t n) {
  std::uint64_t v = 0;
  for (std::size_t i = 0; i < n; ++i) v = v << 8 | p[i];
  return v;
}

class Walk {
 public:
  Walk(const std::uint8_t* bytes, std::size_t size, const PlistLimits& limits)
      : p_(bytes), size_(size), limits_(limits) {}

  std::string run() {
    if (size_ < kHeaderSize + kTrailerSize) return "the binary property list is truncated";
    const std::uint8_t* trailer = p_ + size_ - kTrailerSize;
    offsetSize_ = trailer[6];
    refSize_ = trailer[7];
    objects_ = bigEndian(trailer + 8, 8);
    std::uint64_t root = bigEndian(trailer + 16, 8);
    table_ = bigEndian(trailer + 24, 8);
    std::uint64_t end = size_ - kTrailerSize;
    if (offsetSize_ < 1 || offsetSize_ > 8 || refSize_ < 1 || refSize_ > 8 || objects_ == 0 ||
        root >= objects_ || table_ < kHeaderSize || table_ > end ||
        objects_ > (end - table_) / offsetSize_) {
      return "the binary property list's trailer is malformed";
    }
    std::uint64_t total = count(root, 0);
    if (!why_.empty()) return why_;
    if (total > limits_.maxObjects) {
      return "the property list expands to more than " + std::to_string(limits_.maxObjects) +
             " objects";
    }
    return {};
  }

 private:
  struct Object {
    std::uint8_t type, info;
    std::uint64_t at;      // first byte after the marker and any length
    std::uint64_t length;  // the marker's count (elements, units or bytes)
  };

  // The objects `index` expands to (itself and everything under it), or 0 with why_
  // set. Stops adding once past the limit, so the sum cannot overflow.
  std::uint64_t count(std::uint64_t index, int depth) {
    if (auto it = done_.find(index); it != done_.end()) {
      if (it->second == 0) return refuse("the property list refers to itself in a cycle");
      return it->second;
    }
    if (depth > limits_.maxDepth) {
      return refuse("the property list nests deeper than " + std::to_string(limits_.maxDepth) +
                    " levels");
    }
    auto object = objectAt(index);
    if (!object) return 0;
    std::uint64_t total = 1;
    if (object->type == 0xA || object->type == 0xC || object->type == 0xD) {
      std::uint64_t refs = object->length * (object->type == 0xD ? 2 : 1);
      if (!fits(object->at, refs, refSize_)) return refuse("a container runs past its table");
      done_[index] = 0;  // in progress
      for (std::uint64_t i = 0; i < refs && total <= limits_.maxObjects; ++i) {
        std::uint64_t child = bigEndian(p_ + object->at + i * refSize_, refSize_);
        if (child >= objects_) return refuse("a reference points past the object table");
        if (object->type == 0xD && i < object->length && !checkKey(child)) return 0;
        std::uint64_t n = count(child, depth + 1);
        if (n == 0) return 0;
        total += n;
      }
    } else if (object->type == 0x3 && !checkDate(*object)) {
      return 0;
    }
    done_[index] = total;
    return total;
  }

  std::optional<Object> objectAt(std::uint64_t index) {
    std::uint64_t offset = bigEndian(p_ + table_ + index * offsetSize_, offsetSize_);
    if (offset < kHeaderSize || offset >= table_) {
      refuse("an object offset lies outside the objects");
      return std::nullopt;
    }
    Object o{static_cast<std::uint8_t>(p_[offset] >> 4), static_cast<std::uint8_t>(p_[offset] & 15),
             offset + 1, static_cast<std::uint64_t>(p_[offset] & 15)};
    bool counted = o.type == 0x4 || o.type == 0x5 || o.type == 0x6 || o.type == 0xA ||
                   o.type == 0xC || o.type == 0xD;
    if (counted && o.info == 15) {
      // The count follows as an integer object of 1, 2, 4 or 8 bytes.
      if (o.at >= table_ || p_[o.at] >> 4 != 0x1 || (p_[o.at] & 15) > 3) {
        refuse("an object's length is malformed");
        return std::nullopt;
      }
      std::uint64_t n = std::uint64_t{1} << (p_[o.at] & 15);
      if (!fits(o.at + 1, 1, n)) {
        refuse("an object's length runs past the objects");
        return std::nullopt;
      }
      o.length = bigEndian(p_ + o.at + 1, n);
      o.at += 1 + n;
    }
    return o;
  }

  // Whether `count` items of `width` bytes from `at` stay before the offset table.
  bool fits(std::uint64_t at, std::uint64_t count, std::uint64_t width) const {
    return at <= table_ && count <= (table_ - at) / width;
  }

  bool checkKey(std::uint64_t index) {
    auto key = objectAt(index);
    if (!key) return false;
    if (key->type != 0x5 && key->type != 0x6) {
      refuse("a dictionary key is not a string");
      return false;
    }
    if (key->type == 0x6) {
      if (!fits(key->at, key->length, 2)) {
        refuse("a key runs past the objects");
        return false;
      }
      for (std::uint64_t i = 0; i < key->length; ++i) {
        if (p_[key->at + 2 * i] == 0 && p_[key->at + 2 * i + 1] == 0) {
          refuse("a dictionary key holds U+0000");
          return false;
        }
      }
    }
    return true;
  }

  // libplist hands dates out as 32-bit seconds from the reference date.
  bool checkDate(const Object& date) {
    std::uint64_t width = std::uint64_t{1} << date.info;
    if ((width != 4 && width != 8) || !fits(date.at, 1, width)) return true;  // libplist's call
    double seconds;
    if (width == 8) {
      std::uint64_t bits = bigEndian(p_ + date.at, 8);
      std::memcpy(&seconds, &bits, 8);
    } else {
      auto bits = static_cast<std::uint32_t>(bigEndian(p_ + date.at, 4));
      float f;
      std::memcpy(&f, &bits, 4);
      seconds = f;
    }
    if (!(seconds > std::numeric_limits<std::int32_t>::min() &&
          seconds < std::numeric_limits<std::int32_t>::max())) {
      refuse("a date lies outside the years 1933 to 2069");
      return false;
    }
    return true;
  }

  std::uint64_t refuse(std::string why) {
    if (why_.empty()) why_ = std::move(why);
    return 0;
  }

  const std::uint8_t* p_;
  std::uint64_t size_;
  PlistLimits limits_;
  std::uint8_t offsetSize_ = 0, refSize_ = 0;
  std::uint64_t objects_ = 0, table_ = 0;
  std::unordered_map<std::uint64_t, std::uint64_t> done_;  // 0 while in progress
  std::string why_;
};

bool startsWithTag(const std::uint8_t* p, std::size_t n, std::string_view name) {
  if (n < name.size() + 1) return false;
  for (std::size_t i = 0; i < name.size(); ++i)
    if (std::tolower(p[i]) != name[i]) return false;
  std::uint8_t after = p[name.size()];
  return after == '>' || after == '/' || std::isspace(after);
}

}  // namespace

std::string xmlPlistRefusal(const std::uint8_t* bytes, std::size_t size,
                            const PlistLimits& limits) {
  if (std::memchr(bytes, 0, size)) return "the XML property list holds a NUL byte";
  int depth = 0;
  for (const std::uint8_t* p = bytes;
       (p = static_cast<const std::uint8_t*>(std::memchr(p, '<', size - (p - bytes))));) {
    std::size_t rest = size - static_cast<std::size_t>(p - bytes) - 1;
    ++p;
    bool closing = rest > 0 && *p == '/';
    const std::uint8_t* name = closing ? p + 1 : p;
    std::size_t left = closing ? rest - 1 : rest;
    if (!startsWithTag(name, left, "array") && !startsWithTag(name, left, "dict")) continue;
    if (closing) {
      depth = std::max(0, depth - 1);
      continue;
    }
    const auto* close = static_cast<const std::uint8_t*>(std::memchr(name, '>', left));
    if (close && close[-1] == '/') continue;  // <array/> holds nothing
    if (++depth > limits.maxDepth) {
      return "the property list nests deeper than " + std::to_string(limits.maxDepth) + " levels";
    }
  }
  return {};
}

std::string binaryPlistRefusal(const std::uint8_t* bytes, std::size_t size,
                               const PlistLimits& limits) {
  return Walk(bytes, size, limits).run();
}

}  // namespace corvel
