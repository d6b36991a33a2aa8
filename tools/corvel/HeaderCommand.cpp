// corvel header: a header value of an e-mail message, optionally just its address.
#include <iostream>

#include "Corvelbase/Email.h"
#include "tools/corvel/Commands.h"
#include "tools/corvel/TextInput.h"

namespace corvel::tool {
namespace {

constexpr std::string_view kAddressOption = "--address";

int run(const Arguments& args) {
  bool address = false;
  std::vector<std::string> positional;
  for (const std::string& arg : args) {
    if (arg == kAddressOption)
      address = true;
    else if (arg.size() > 1 && arg[0] == '-' && positional.size() == 1)
      return misuse("header: unknown option '" + arg + "'");
    else
      positional.push_back(arg);
  }
  if (positional.empty()) return misuse("header: give the FIELD to read");
  if (positional.size() > 2) return misuse("header: give one FIELD and at most one FILE");
  std::optional<String> message =
      readTextInput("header", positional.size() > 1 ? positional[1] : "");
  if (!message) return 2;
  std::optional<String> value =
      Email::headerValueForField(*message, fromUTF8(positional[0]), address);
  if (!value) return 1;
  std::cout << toUTF8(*value) << '\n';
  return 0;
}

CommandRegistration reg("header",
                        "header FIELD [--address] [FILE] : the header value (or its address) from "
                        "an e-mail message in FILE or standard input (exit 1 when there is none)",
                        &run);

}  // namespace
}  // namespace corvel::tool
