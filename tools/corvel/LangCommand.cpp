// corvel lang: the dominant language of a file or of standard input.
#include <iostream>

#include "Corvelbase/Language.h"
#include "tools/corvel/Commands.h"
#include "tools/corvel/TextInput.h"

namespace corvel::tool {
namespace {

int run(const Arguments& args) {
  if (args.size() > 1) return misuse("lang: give at most one file");
  if (!args.empty() && args[0].size() > 1 && args[0][0] == '-')
    return misuse("lang: unknown option '" + args[0] + "'");
  std::optional<String> text = readTextInput("lang", args.empty() ? "" : args[0]);
  if (!text) return 2;
  std::optional<std::string> code = Language::dominantLanguage(*text);
  if (!code) return 1;
  std::cout << *code << '\n';
  return 0;
}

CommandRegistration reg("lang",
                        "lang [FILE] : the dominant language of FILE or standard input (exit 1 "
                        "when there is none)",
                        &run);

}  // namespace
}  // namespace corvel::tool
