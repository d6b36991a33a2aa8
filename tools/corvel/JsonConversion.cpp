#include "tools/corvel/JsonConversion.h"

namespace corvel::tool {

namespace {

using nlohmann::json;
constexpr int kMaxNesting = 100;

}  // namespace

std::optional<PropertyList> propertyListFromJSON(const nlohmann::json& value, int depth,
                                                 std::string& error) {
  if (depth > kMaxNesting) {
    error = "nested too deeply";
    return std::nullopt;
  }
  switch (value.type()) {
    case json::value_t::boolean:
      return PropertyList(value.get<bool>());
    case json::value_t::number_unsigned:
      return PropertyList(value.get<std::uint64_t>());
    case json::value_t::number_integer:
      return PropertyList(value.get<std::int64_t>());
    case json::value_t::number_float:
      return PropertyList(value.get<double>());
    case json::value_t::string:
      return PropertyList(fromUTF8(value.get<std::string>()));
    case json::value_t::array: {
      PropertyList::Array array;
      for (const json& element : value) {
        auto converted = propertyListFromJSON(element, depth + 1, error);
        if (!converted) return std::nullopt;
        array.push_back(std::move(*converted));
      }
      return PropertyList(std::move(array));
    }
    case json::value_t::object: {
      PropertyList::Dictionary dictionary;
      for (const auto& [key, element] : value.items()) {
        auto converted = propertyListFromJSON(element, depth + 1, error);
        if (!converted) return std::nullopt;
        dictionary[key] = std::move(*converted);
      }
      return PropertyList(std::move(dictionary));
    }
    default:  // null and binary: what a missing value reads as
      return PropertyList();
  }
}

nlohmann::json jsonFromPropertyList(const PropertyList& value) {
  return std::visit(
      [](const auto& v) -> json {
        using T = std::decay_t<decltype(v)>;
        if constexpr (std::is_same_v<T, String>) {
          return toUTF8(v);
        } else if constexpr (std::is_same_v<T, PropertyList::Array>) {
          json array = json::array();
          for (const auto& element : v) array.push_back(jsonFromPropertyList(element));
          return array;
        } else if constexpr (std::is_same_v<T, PropertyList::Dictionary>) {
          json object = json::object();
          for (const auto& [key, element] : v) object[key] = jsonFromPropertyList(element);
          return object;
        } else if constexpr (std::is_same_v<T, bool> || std::is_same_v<T, std::int64_t> ||
                             std::is_same_v<T, std::uint64_t> || std::is_same_v<T, double>) {
          return v;
        } else {
          return nullptr;  // block dictionaries hold nothing else
        }
      },
      value.value());
}

}  // namespace corvel::tool
