#include "Corvelbase/platform/PropertyList.h"

#include <plist/plist.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <limits>
#include <memory>

#include "Corvelbase/platform/Files.h"
#include "platform/PlistShape.h"

namespace corvel {

namespace {

struct PlistFree {
  void operator()(plist_t p) const { plist_free(p); }
};
using PlistPtr = std::unique_ptr<void, PlistFree>;

// libplist's dates are seconds from the reference date, handed over as whole seconds and
// microseconds in 32 bits each; it reads them back with both parts rounded towards zero
// and the microseconds without their sign.
struct DateParts {
  std::int32_t seconds;
  std::int32_t micros;  // 0 to 999999
};

double dateFromParts(DateParts parts) {
  double fraction = parts.micros / 1e6;
  return parts.seconds + (parts.seconds < 0 ? -fraction : fraction);
}

bool dateInRange(double seconds) {
  // Both ends are excluded: libplist's conversions give them for any value beyond.
  return seconds > std::numeric_limits<std::int32_t>::min() &&
         seconds < std::numeric_limits<std::int32_t>::max();
}

// A date node for the microsecond nearest to `seconds`; nullptr outside the 32-bit span.
// (libplist adds the parts as a double that may fall just short of that microsecond,
// and then reads it back one microsecond nearer to the reference date.)
plist_t newDate(double seconds) {
  if (!dateInRange(seconds)) return nullptr;
  auto whole = static_cast<std::int32_t>(seconds);
  auto micros = static_cast<std::int32_t>(std::lround((seconds - whole) * 1e6));
  if (micros == 1'000'000 || micros == -1'000'000) {
    if (!dateInRange(whole + micros / 1'000'000)) return nullptr;
    whole += micros / 1'000'000;
    micros = 0;
  }
  return plist_new_date(whole, micros);
}

// libplist keeps text as C strings: U+0000 cannot be written, and a key must be UTF-8.
bool writableKey(const std::string& key) {
  return key.find('\0') == std::string::npos && toUTF8(fromUTF8(key)) == key;
}

plist_t toNode(const PropertyList& value, int depth) {
  if (depth > kMaxPropertyListDepth) return nullptr;
  const auto& v = value.value();
  if (auto b = std::get_if<bool>(&v)) return plist_new_bool(*b ? 1 : 0);
  if (auto i = std::get_if<std::int64_t>(&v)) return plist_new_uint(static_cast<uint64_t>(*i));
  if (auto u = std::get_if<std::uint64_t>(&v)) return plist_new_uint(*u);
  if (auto d = std::get_if<double>(&v)) return plist_new_real(*d);
  if (auto s = std::get_if<String>(&v)) {
    if (s->find(u'\0') != String::npos) return nullptr;
    return plist_new_string(toUTF8(*s).c_str());
  }
  if (auto data = std::get_if<Data>(&v)) {
    return plist_new_data(reinterpret_cast<const char*>(data->data()), data->size());
  }
  if (auto uid = std::get_if<PropertyList::Uid>(&v)) return plist_new_uid(uid->value);
  if (auto date = std::get_if<PropertyList::Date>(&v))
    return newDate(date->secondsSinceReferenceDate);
  if (auto array = std::get_if<PropertyList::Array>(&v)) {
    PlistPtr node(plist_new_array());
    for (const auto& item : *array) {
      plist_t child = toNode(item, depth + 1);
      if (!child) return nullptr;
      plist_array_append_item(node.get(), child);
    }
    return node.release();
  }
  if (auto dict = std::get_if<PropertyList::Dictionary>(&v)) {
    PlistPtr node(plist_new_dict());
    for (const auto& [key, item] : *dict) {
      if (!writableKey(key)) return nullptr;
      plist_t child = toNode(item, depth + 1);
      if (!child) return nullptr;
      plist_dict_set_item(node.get(), key.c_str(), child);
    }
    return node.release();
  }
  return nullptr;  // the absent value has no property-list form
}

// Converts libplist's tree; the shape checks before parsing have made every key safe to
// read. Counts objects as it goes (XML has no shared references, so this is the bound
// for it).
class NodeReader {
 public:
  explicit NodeReader(std::string* error) : error_(error) {}

  std::optional<PropertyList> read(plist_t node, int depth) {
    if (!node || depth > kMaxPropertyListDepth) return fail("the property list is malformed");
    if (++objects_ > kMaxPropertyListObjects) {
      return fail("the property list holds more than " + std::to_string(kMaxPropertyListObjects) +
                  " objects");
    }
    switch (plist_get_node_type(node)) {
      case PLIST_BOOLEAN: {
        uint8_t b = 0;
        plist_get_bool_val(node, &b);
        return PropertyList(b != 0);
      }
      case PLIST_UINT: {
        uint64_t u = 0;
        plist_get_uint_val(node, &u);
        return PropertyList(u);
      }
      case PLIST_REAL: {
        double d = 0;
        plist_get_real_val(node, &d);
        return PropertyList(d);
      }
      case PLIST_STRING: {
        uint64_t length = 0;
        const char* s = plist_get_string_ptr(node, &length);
        return PropertyList(fromUTF8(std::string_view(s ? s : "", s ? length : 0)));
      }
      case PLIST_DATA: {
        uint64_t length = 0;
        const char* bytes = plist_get_data_ptr(node, &length);
        const auto* begin = reinterpret_cast<const std::uint8_t*>(bytes);
        return PropertyList(bytes ? Data(begin, begin + length) : Data());
      }
      case PLIST_DATE: {
        DateParts parts{0, 0};
        plist_get_date_val(node, &parts.seconds, &parts.micros);
        if (!dateInRange(parts.seconds)) return fail("a date lies outside the years 1933 to 2069");
        return PropertyList(PropertyList::Date{dateFromParts(parts)});
      }
      case PLIST_UID: {
        uint64_t uid = 0;
        plist_get_uid_val(node, &uid);
        return PropertyList(PropertyList::Uid{uid});
      }
      case PLIST_ARRAY:
        return readArray(node, depth);
      case PLIST_DICT:
        return readDictionary(node, depth);
      default:
        return fail("the property list holds an object of an unknown type");
    }
  }

 private:
  std::optional<PropertyList> readArray(plist_t node, int depth) {
    PropertyList::Array array;
    // The iterator, not plist_array_get_item: libplist finds the n-th item of a list it
    // parsed by walking from the first, which makes reading an array quadratic.
    plist_array_iter it = nullptr;
    plist_array_new_iter(node, &it);
    std::unique_ptr<void, decltype(&std::free)> iterator(it, &std::free);
    for (uint32_t i = 0, count = plist_array_get_size(node); i < count; ++i) {
      plist_t child = nullptr;
      plist_array_next_item(node, it, &child);
      auto item = read(child, depth + 1);
      if (!item) return std::nullopt;
      array.push_back(std::move(*item));
    }
    return PropertyList(std::move(array));
  }

  std::optional<PropertyList> readDictionary(plist_t node, int depth) {
    PropertyList::Dictionary dict;
    plist_dict_iter it = nullptr;
    plist_dict_new_iter(node, &it);
    std::unique_ptr<void, decltype(&std::free)> iterator(it, &std::free);
    for (uint32_t i = 0, count = plist_dict_get_size(node); i < count; ++i) {
      char* rawKey = nullptr;
      plist_t child = nullptr;
      plist_dict_next_item(node, it, &rawKey, &child);
      std::unique_ptr<char, decltype(&std::free)> key(rawKey, &std::free);
      if (!key || !child) return fail("the property list is malformed");
      std::string name(key.get());
      if (toUTF8(fromUTF8(name)) != name) return fail("a dictionary key is not UTF-8");
      auto item = read(child, depth + 1);
      if (!item) return std::nullopt;
      dict.insert_or_assign(std::move(name), std::move(*item));
    }
    return PropertyList(std::move(dict));
  }

  std::optional<PropertyList> fail(const std::string& why) {
    if (error_ && error_->empty()) *error_ = why;
    return std::nullopt;
  }

  std::string* error_;
  std::uint64_t objects_ = 0;
};

template <typename T>
T saturatingCast(double d) {
  if (std::isnan(d)) return 0;
  if (d <= static_cast<double>(std::numeric_limits<T>::min())) {
    return std::numeric_limits<T>::min();
  }
  if (d >= static_cast<double>(std::numeric_limits<T>::max())) {
    return std::numeric_limits<T>::max();
  }
  return static_cast<T>(d);
}

}  // namespace

bool PropertyList::isNumber() const {
  return std::holds_alternative<bool>(value_) || std::holds_alternative<std::int64_t>(value_) ||
         std::holds_alternative<std::uint64_t>(value_) || std::holds_alternative<double>(value_);
}

const PropertyList* PropertyList::find(const std::string& key) const {
  const Dictionary* dict = dictionary();
  if (!dict) return nullptr;
  auto it = dict->find(key);
  return it == dict->end() ? nullptr : &it->second;
}

double PropertyList::doubleValue() const {
  if (auto b = std::get_if<bool>(&value_)) return *b ? 1.0 : 0.0;
  if (auto i = std::get_if<std::int64_t>(&value_)) return static_cast<double>(*i);
  if (auto u = std::get_if<std::uint64_t>(&value_)) return static_cast<double>(*u);
  if (auto d = std::get_if<double>(&value_)) return *d;
  if (auto s = std::get_if<String>(&value_)) {
    std::string text = toUTF8(*s);
    return std::strtod(text.c_str(), nullptr);
  }
  return 0;
}

float PropertyList::floatValue() const { return static_cast<float>(doubleValue()); }

std::uint64_t PropertyList::unsignedIntegerValue() const {
  if (auto u = std::get_if<std::uint64_t>(&value_)) return *u;
  if (auto i = std::get_if<std::int64_t>(&value_)) return static_cast<std::uint64_t>(*i);
  double d = doubleValue();
  // Negative values wrap as the two's-complement cast of the platform does.
  if (d < 0) return static_cast<std::uint64_t>(saturatingCast<std::int64_t>(d));
  return saturatingCast<std::uint64_t>(d);
}

std::uint32_t PropertyList::unsignedIntValue() const {
  return static_cast<std::uint32_t>(unsignedIntegerValue());
}

std::int64_t PropertyList::integerValue() const {
  if (auto i = std::get_if<std::int64_t>(&value_)) return *i;
  if (auto u = std::get_if<std::uint64_t>(&value_)) return static_cast<std::int64_t>(*u);
  return saturatingCast<std::int64_t>(doubleValue());
}

bool PropertyList::boolValue() const { return integerValue() != 0 || doubleValue() != 0; }

std::optional<Data> PropertyList::serialize(Format format) const {
  PlistPtr node(toNode(*this, 0));
  if (!node) return std::nullopt;
  char* bytes = nullptr;
  uint32_t length = 0;
  if (format == Format::XML) {
    plist_to_xml(node.get(), &bytes, &length);
  } else {
    plist_to_bin(node.get(), &bytes, &length);
  }
  if (!bytes) return std::nullopt;
  Data out(reinterpret_cast<uint8_t*>(bytes), reinterpret_cast<uint8_t*>(bytes) + length);
  if (format == Format::XML) {
    plist_to_xml_free(bytes);
  } else {
    plist_to_bin_free(bytes);
  }
  return out;
}

std::optional<PropertyList> PropertyList::deserialize(const std::uint8_t* bytes, std::size_t size,
                                                      std::string* error) {
  std::string why;
  if (!error) error = &why;
  error->clear();
  if (!bytes || size < 8) {
    *error = "the data is too short to be a property list";
    return std::nullopt;
  }
  if (size > kMaxPropertyListBytes) {
    *error =
        "the property list is larger than " + std::to_string(kMaxPropertyListBytes >> 20) + " MiB";
    return std::nullopt;
  }
  const char* text = reinterpret_cast<const char*>(bytes);
  bool binary = plist_is_binary(text, static_cast<uint32_t>(size));
  PlistLimits limits{kMaxPropertyListObjects, kMaxPropertyListDepth};
  *error = binary ? binaryPlistRefusal(bytes, size, limits) : xmlPlistRefusal(bytes, size, limits);
  if (!error->empty()) return std::nullopt;
  plist_t raw = nullptr;
  plist_from_memory(text, static_cast<uint32_t>(size), &raw);
  PlistPtr node(raw);
  if (!node) {
    *error = "the data is not a well-formed property list";
    return std::nullopt;
  }
  return NodeReader(error).read(node.get(), 0);
}

bool PropertyList::writeToFile(const std::string& path, Format format) const {
  auto bytes = serialize(format);
  return bytes && writeFileAtomically(path, *bytes);
}

std::optional<PropertyList> PropertyList::readFromFile(const std::string& path,
                                                       std::string* error) {
  auto bytes = readFile(path);
  if (!bytes) {
    if (error) *error = "the file cannot be read";
    return std::nullopt;
  }
  return deserialize(*bytes, error);
}

}  // namespace corvel
