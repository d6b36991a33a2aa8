// Property-list values: the plain data (dictionaries, arrays, strings, numbers, data,
// dates, booleans and keyed-archive UIDs) that the library stores and exchanges, with
// reading and writing of real XML and binary property lists.
//
// A PropertyList is a value: copying copies the whole tree. Dictionary keys are UTF-8;
// string values are UTF-16 like every other String of the API.
//
// Reading hostile bytes: lists larger than kMaxPropertyListBytes, holding (once shared
// references of a binary list are expanded, as libplist expands them) more than
// kMaxPropertyListObjects objects, or nesting containers deeper than
// kMaxPropertyListDepth are refused before they are parsed, with the reason; so are
// dictionary keys that are not UTF-8 or hold U+0000 (text is kept as C strings by
// libplist, which cannot carry such a key). String values keep every character,
// U+0000 included.
//
// Dates: libplist hands dates over as whole seconds and microseconds (both rounded
// towards zero) in 32 bits, so dates are kept between 1933-12-13 and 2069-01-19, to
// within a microsecond (each pass through libplist may drop one, besides the double's
// own rounding); a list holding a date outside that span is refused. A date
// less than a second before the reference date reads as the same time after it (the
// sign is lost in libplist's interface).
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

inline constexpr std::size_t kMaxPropertyListBytes = std::size_t{64} << 20;
inline constexpr std::uint64_t kMaxPropertyListObjects = 1'000'000;
inline constexpr int kMaxPropertyListDepth = 512;

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

  // Serialisation through libplist. Writing fails (nullopt) for a tree that could not be
  // read back as it is: one holding the absent value, a key that is not UTF-8 or holds
  // U+0000, a string holding U+0000 (libplist writes C strings), a date outside the
  // span above, or containers nested deeper than kMaxPropertyListDepth. Reading accepts
  // XML and binary lists (detected from the bytes) and gives nullopt for anything that
  // is not a well-formed property list within the limits above, with the reason in
  // `error` if given.
  std::optional<Data> serialize(Format format) const;
  static std::optional<PropertyList> deserialize(const std::uint8_t* bytes, std::size_t size,
                                                 std::string* error = nullptr);
  static std::optional<PropertyList> deserialize(const Data& bytes, std::string* error = nullptr) {
    return deserialize(bytes.data(), bytes.size(), error);
  }

  // Files: written atomically (a temporary file beside it, then renamed over it, see
  // writeFileAtomically). Reading fails as deserialize does, or when the file cannot be
  // read.
  bool writeToFile(const std::string& path, Format format) const;
  static std::optional<PropertyList> readFromFile(const std::string& path,
                                                  std::string* error = nullptr);

  friend bool operator==(const PropertyList&, const PropertyList&) = default;

 private:
  Value value_;
};

}  // namespace corvel
