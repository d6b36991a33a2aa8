#include "Corvelbase/platform/PropertyList.h"

#include <plist/plist.h>

#include <cmath>
#include <cstdlib>
#include <limits>
#include <memory>

#include "Corvelbase/platform/Files.h"

namespace corvel {

namespace {

struct PlistFree {
  void operator()(plist_t p) const { plist_free(p); }
};
using PlistPtr = std::unique_ptr<void, PlistFree>;

// Seconds between the Unix epoch and the property lists' reference date; libplist's
// dates count from the Unix epoch.
constexpr double kReferenceDateOffset = 978307200.0;
// Deeper trees than this are refused rather than risking the stack on hostile input.
constexpr int kMaxDepth = 512;

plist_t toNode(const PropertyList& value, int depth);

plist_t toNodeChecked(const PropertyList& value, int depth) {
  if (depth > kMaxDepth) return nullptr;
  return toNode(value, depth);
}

plist_t toNode(const PropertyList& value, int depth) {
  const auto& v = value.value();
  if (auto b = std::get_if<bool>(&v)) return plist_new_bool(*b ? 1 : 0);
  if (auto i = std::get_if<std::int64_t>(&v)) return plist_new_uint(static_cast<uint64_t>(*i));
  if (auto u = std::get_if<std::uint64_t>(&v)) return plist_new_uint(*u);
  if (auto d = std::get_if<double>(&v)) return plist_new_real(*d);
  if (auto s = std::get_if<String>(&v)) return plist_new_string(toUTF8(*s).c_str());
  if (auto data = std::get_if<Data>(&v)) {
    return plist_new_data(reinterpret_cast<const char*>(data->data()), data->size());
  }
  if (auto uid = std::get_if<PropertyList::Uid>(&v)) return plist_new_uid(uid->value);
  if (auto date = std::get_if<PropertyList::Date>(&v)) {
    double unix = date->secondsSinceReferenceDate + kReferenceDateOffset;
    double whole = std::floor(unix);
    return plist_new_date(static_cast<int32_t>(whole),
                          static_cast<int32_t>(std::lround((unix - whole) * 1e6)));
  }
  if (auto array = std::get_if<PropertyList::Array>(&v)) {
    PlistPtr node(plist_new_array());
    for (const auto& item : *array) {
      plist_t child = toNodeChecked(item, depth + 1);
      if (!child) return nullptr;
      plist_array_append_item(node.get(), child);
    }
    return node.release();
  }
  if (auto dict = std::get_if<PropertyList::Dictionary>(&v)) {
    PlistPtr node(plist_new_dict());
    for (const auto& [key, item] : *dict) {
      plist_t child = toNodeChecked(item, depth + 1);
      if (!child) return nullptr;
      plist_dict_set_item(node.get(), key.c_str(), child);
    }
    return node.release();
  }
  return nullptr;  // the absent value has no property-list form
}

std::optional<PropertyList> fromNode(plist_t node, int depth) {
  if (!node || depth > kMaxDepth) return std::nullopt;
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
    case PLIST_STRING:
    case PLIST_KEY: {
      char* s = nullptr;
      plist_get_string_val(node, &s);
      PropertyList result(fromUTF8(s ? s : ""));
      std::free(s);
      return result;
    }
    case PLIST_DATA: {
      char* bytes = nullptr;
      uint64_t length = 0;
      plist_get_data_val(node, &bytes, &length);
      Data data(reinterpret_cast<uint8_t*>(bytes), reinterpret_cast<uint8_t*>(bytes) + length);
      std::free(bytes);
      return PropertyList(std::move(data));
    }
    case PLIST_DATE: {
      int32_t sec = 0, usec = 0;
      plist_get_date_val(node, &sec, &usec);
      return PropertyList(PropertyList::Date{sec + usec / 1e6 - kReferenceDateOffset});
    }
    case PLIST_UID: {
      uint64_t uid = 0;
      plist_get_uid_val(node, &uid);
      return PropertyList(PropertyList::Uid{uid});
    }
    case PLIST_ARRAY: {
      PropertyList::Array array;
      uint32_t count = plist_array_get_size(node);
      array.reserve(count);
      for (uint32_t i = 0; i < count; ++i) {
        auto item = fromNode(plist_array_get_item(node, i), depth + 1);
        if (!item) return std::nullopt;
        array.push_back(std::move(*item));
      }
      return PropertyList(std::move(array));
    }
    case PLIST_DICT: {
      PropertyList::Dictionary dict;
      plist_dict_iter it = nullptr;
      plist_dict_new_iter(node, &it);
      std::optional<PropertyList> failed;
      bool ok = true;
      while (it) {
        char* key = nullptr;
        plist_t child = nullptr;
        plist_dict_next_item(node, it, &key, &child);
        if (!child) {
          std::free(key);
          break;
        }
        auto item = fromNode(child, depth + 1);
        if (!item || !key) ok = false;
        if (ok) dict.emplace(key, std::move(*item));
        std::free(key);
        if (!ok) break;
      }
      std::free(it);
      if (!ok) return std::nullopt;
      return PropertyList(std::move(dict));
    }
    default:
      return std::nullopt;
  }
}

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

std::optional<PropertyList> PropertyList::deserialize(const std::uint8_t* bytes, std::size_t size) {
  if (!bytes || size == 0 || size > std::numeric_limits<uint32_t>::max()) return std::nullopt;
  plist_t raw = nullptr;
  plist_from_memory(reinterpret_cast<const char*>(bytes), static_cast<uint32_t>(size), &raw);
  PlistPtr node(raw);
  return fromNode(node.get(), 0);
}

bool PropertyList::writeToFile(const std::string& path, Format format) const {
  auto bytes = serialize(format);
  return bytes && writeFileAtomically(path, *bytes);
}

std::optional<PropertyList> PropertyList::readFromFile(const std::string& path) {
  auto bytes = readFile(path);
  if (!bytes) return std::nullopt;
  return deserialize(*bytes);
}

}  // namespace corvel
