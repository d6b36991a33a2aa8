// The subcommands of `corvel`. Each returns the process exit status: 0 success, 1 when
// the command ran but found nothing or some inputs failed, 2 on misuse or bad input.
#pragma once

#include <string>
#include <vector>

namespace corvel::tool {

using Arguments = std::vector<std::string>;

struct Command {
  const char* name;
  const char* usage;
  int (*run)(const Arguments& args);
};

// Prints "corvel: <message>" to standard error and returns 2.
int misuse(const std::string& message);

}  // namespace corvel::tool
