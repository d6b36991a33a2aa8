// The error object handed to completions: a domain, a code and a user-info dictionary.
#pragma once

#include <cstdint>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/PropertyList.h"

namespace corvel {

struct CORVEL_EXPORT Error {
  std::string domain;
  std::int64_t code = 0;
  PropertyList::Dictionary userInfo;

  // The platform's description form:
  // Error Domain=<domain> Code=<code> "(null)" UserInfo={key=value, ...}
  std::string description() const;
  // The string value of a user-info key, or "" when absent or not a string.
  std::string userInfoString(const std::string& key) const;

  friend bool operator==(const Error&, const Error&) = default;
};

}  // namespace corvel
