#include "Corvelbase/platform/Error.h"

namespace corvel {

namespace {

std::string describe(const PropertyList& value) {
  if (auto s = value.string()) return toUTF8(*s);
  if (value.isNumber()) {
    if (std::holds_alternative<double>(value.value())) return std::to_string(value.doubleValue());
    return std::to_string(value.integerValue());
  }
  if (value.dictionary()) return "{...}";
  if (value.array()) return "(...)";
  if (value.data()) return "<data>";
  return "(null)";
}

}  // namespace

std::string Error::description() const {
  std::string out = "Error Domain=" + domain + " Code=" + std::to_string(code) + " \"(null)\"";
  if (!userInfo.empty()) {
    out += " UserInfo={";
    bool first = true;
    for (const auto& [key, value] : userInfo) {
      if (!first) out += ", ";
      first = false;
      out += key + "=" + describe(value);
    }
    out += "}";
  }
  return out;
}

std::string Error::userInfoString(const std::string& key) const {
  auto it = userInfo.find(key);
  if (it == userInfo.end() || !it->second.string()) return {};
  return toUTF8(*it->second.string());
}

}  // namespace corvel
