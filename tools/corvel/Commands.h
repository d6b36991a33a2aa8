// The subcommands of `corvel`. Each command file registers itself with a static
// CommandRegistration, so adding a command touches no other file. A command returns the
// process exit status: 0 success, 1 when it ran but found nothing or some inputs
// failed, 2 on misuse or bad input.
#pragma once

#include <string>
#include <vector>

namespace corvel::tool {

using Arguments = std::vector<std::string>;
using CommandFunction = int (*)(const Arguments& args);

struct CommandRegistration {
  // `usage` is one line, starting with the command's name.
  CommandRegistration(const char* name, const char* usage, CommandFunction run);
};

// Prints "corvel: <message>" to standard error and returns 2.
int misuse(const std::string& message);

}  // namespace corvel::tool
