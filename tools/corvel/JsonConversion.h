// JSON <-> property-list values, for the commands that read and print block dictionaries.
#pragma once

#include <nlohmann/json.hpp>
#include <optional>
#include <string>

#include "Corvelbase/platform/PropertyList.h"

namespace corvel::tool {

// JSON numbers, strings, arrays and objects as property-list values; null reads as the
// absent value. nullopt with `error` set when the JSON nests deeper than 100 levels.
std::optional<PropertyList> propertyListFromJSON(const nlohmann::json& value, int depth,
                                                 std::string& error);

// Property-list values as JSON; data, UIDs and dates, which block dictionaries never hold,
// print as null.
nlohmann::json jsonFromPropertyList(const PropertyList& value);

}  // namespace corvel::tool
