// corvel: the library's jobs on the command line.
#include <iostream>
#include <map>

#include "Commands.h"

namespace corvel::tool {

namespace {

struct Command {
  const char* usage;
  CommandFunction run;
};

std::map<std::string, Command>& commands() {
  static std::map<std::string, Command> table;
  return table;
}

void printUsage(std::ostream& out) {
  out << "usage: corvel COMMAND [ARGS...]\n\ncommands:\n";
  for (const auto& [name, command] : commands()) out << "  " << command.usage << '\n';
}

}  // namespace

CommandRegistration::CommandRegistration(const char* name, const char* usage, CommandFunction run) {
  commands()[name] = Command{usage, run};
}

int misuse(const std::string& message) {
  std::cerr << "corvel: " << message << '\n';
  return 2;
}

int main(int argc, char** argv) {
  std::string first = argc < 2 ? "" : argv[1];
  if (argc < 2 || first == "--help" || first == "-h") {
    printUsage(argc < 2 ? std::cerr : std::cout);
    return argc < 2 ? 2 : 0;
  }
  auto it = commands().find(first);
  if (it == commands().end()) {
    printUsage(std::cerr);
    return misuse("unknown command '" + first + "'");
  }
  return it->second.run(Arguments(argv + 2, argv + argc));
}

}  // namespace corvel::tool

int main(int argc, char** argv) { return corvel::tool::main(argc, argv); }
