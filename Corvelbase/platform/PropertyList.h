// Property-list values: the plain data (dictionaries, arrays, strings, numbers, data,
// dates, booleans and keyed-archive UIDs) that the library stores and exchanges, with
// reading and writing of real XML and binary property lists.
//
// A PropertyList is a value: copying copies the whole tree. Dictionary keys are UTF-8;
// string values are UTF-16 like every other String of the API.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

class CORVEL_EXPORT PropertyList {
 public:
  using Array = std::vector<PropertyList>;
  using Dictionary = std::map<std::string, PropertyList>;
  // A reference to an object of a keyed archive (binary property lists only).
  struct Uid {
    std::uint64_t value = 0;
    friend bool operator==(const Uid&, const Uid&) = default;
  };
  // Seconds since 2001-01-01 00:00:00 UTC, as property lists count time.
  struct Date {
    double secondsSinceReferenceDate = 0;
    friend bool operator==(const Date&, const Date&) = default;
  };
  // Property lists have one integer type: reading always gives std::uint64_t (a
  // negative std::int64_t comes back as its two's complement; integerValue() restores
  // it).
  using Value = std::variant<std::monostate, bool, std::int64_t, std::uint64_t, double, String,
                             Data, Array, Dictionary, Uid, Date>;

  enum class Format { XML, Binary };

  PropertyList() = default;  // the absent value
  PropertyList(bool v) : value_(v) {}
  PropertyList(int v) : value_(static_cast<std::int64_t>(v)) {}
  PropertyList(std::int64_t v) : value_(v) {}
  PropertyList(std::uint64_t v) : value_(v) {}
  PropertyList(double v) : value_(v) {}
  PropertyList(String v) : value_(std::move(v)) {}
  PropertyList(const char16_t* v) : value_(String(v)) {}
  PropertyList(Data v) : value_(std::move(v)) {}
  PropertyList(Array v) : value_(std::move(v)) {}
  PropertyList(Dictionary v) : value_(std::move(v)) {}
  PropertyList(Uid v) : value_(v) {}
  PropertyList(Date v) : value_(v) {}

  const Value& value() const { return value_; }
  Value& value() { return value_; }
  bool isNull() const { return std::holds_alternative<std::monostate>(value_); }

  // Typed views: nullptr when the value is of another type.
  const String* string() const { return std::get_if<String>(&value_); }
  const Data* data() const { return std::get_if<Data>(&value_); }
  const Array* array() const { return std::get_if<Array>(&value_); }
  const Dictionary* dictionary() const { return std::get_if<Dictionary>(&value_); }
  Array* array() { return std::get_if<Array>(&value_); }
  Dictionary* dictionary() { return std::get_if<Dictionary>(&value_); }
  const Uid* uid() const { return std::get_if<Uid>(&value_); }
  bool isNumber() const;

  // Member of a dictionary, or nullptr when this is no dictionary or lacks the key.
  const PropertyList* find(const std::string& key) const;

  // Numeric conversions in the manner of the platform's number objects: numbers and
  // booleans convert (narrowing like a C cast, but saturating where a C cast would be
  // undefined, as for NaN or out-of-range doubles); a string converts from its leading
  // decimal number; anything else gives 0.
  double doubleValue() const;
  float floatValue() const;
  std::uint32_t unsignedIntValue() const;
  std::uint64_t unsignedIntegerValue() const;
  std::int64_t integerValue() const;
  bool boolValue() const;

  // Serialisation through libplist. Writing fails (nullopt) only for a tree holding the
  // absent value. Reading accepts XML and binary lists (detected from the bytes) and
  // gives nullopt for anything that is not a well-formed property list.
  std::optional<Data> serialize(Format format) const;
  static std::optional<PropertyList> deserialize(const std::uint8_t* bytes, std::size_t size);
  static std::optional<PropertyList> deserialize(const Data& bytes) {
    return deserialize(bytes.data(), bytes.size());
  }

  // Files: written atomically (a temporary file beside it, then renamed over it).
  bool writeToFile(const std::string& path, Format format) const;
  static std::optional<PropertyList> readFromFile(const std::string& path);

  friend bool operator==(const PropertyList&, const PropertyList&) = default;

 private:
  Value value_;
};

}  // namespace corvel
