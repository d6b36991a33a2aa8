// corvel: the library's jobs on the command line.
#include <cstring>
#include <iostream>

#include "Commands.h"

namespace corvel::tool {

namespace {

// One row per subcommand, in the order `corvel --help` lists them.
const Command kCommands[] = {
    {nullptr, nullptr, nullptr},
};

void printUsage(std::ostream& out) {
  out << "usage: corvel COMMAND [ARGS...]\n\ncommands:\n";
  for (const auto& command : kCommands) {
    if (command.name) out << "  " << command.usage << '\n';
  }
}

}  // namespace

int misuse(const std::string& message) {
  std::cerr << "corvel: " << message << '\n';
  return 2;
}

int main(int argc, char** argv) {
  if (argc < 2 || !std::strcmp(argv[1], "--help") || !std::strcmp(argv[1], "-h")) {
    printUsage(argc < 2 ? std::cerr : std::cout);
    return argc < 2 ? 2 : 0;
  }
  for (const auto& command : kCommands) {
    if (command.name && !std::strcmp(argv[1], command.name)) {
      return command.run(Arguments(argv + 2, argv + argc));
    }
  }
  printUsage(std::cerr);
  return misuse(std::string("unknown command '") + argv[1] + "'");
}

}  // namespace corvel::tool

int main(int argc, char** argv) { return corvel::tool::main(argc, argv); }
