#include "tools/corvel/TextInput.h"

#include <iostream>
#include <iterator>

#include "Corvelbase/platform/Files.h"

namespace corvel::tool {

std::optional<String> readTextInput(const std::string& commandName, const std::string& path) {
  if (path.empty() || path == "-") {
    std::string bytes((std::istreambuf_iterator<char>(std::cin)), std::istreambuf_iterator<char>());
    if (std::cin.bad()) {
      std::cerr << "corvel: " << commandName << ": standard input cannot be read\n";
      return std::nullopt;
    }
    return fromUTF8(bytes);
  }
  std::optional<Data> bytes = readFile(path);
  if (!bytes) {
    std::cerr << "corvel: " << path << ": cannot be read\n";
    return std::nullopt;
  }
  return fromUTF8(std::string_view(reinterpret_cast<const char*>(bytes->data()), bytes->size()));
}

}  // namespace corvel::tool
