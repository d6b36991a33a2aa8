// Reading a command's text input: a file, or standard input when no file (or "-") is given.
#pragma once

#include <optional>
#include <string>

#include "Corvelbase/platform/String.h"

namespace corvel::tool {

// The input decoded from UTF-8 (malformed bytes become U+FFFD), or nullopt when the file
// cannot be read; then a message naming it has gone to standard error.
std::optional<String> readTextInput(const std::string& commandName, const std::string& path);

}  // namespace corvel::tool
