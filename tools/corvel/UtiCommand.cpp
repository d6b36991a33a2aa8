// corvel uti: the type of a file, or an identifier as given, and every type it conforms to.
#include <sys/stat.h>

#include <iostream>

#include "Corvelbase/platform/TypeRegistry.h"
#include "tools/corvel/Commands.h"

namespace corvel::tool {
namespace {

int run(const Arguments& args) {
  if (args.size() != 1 || args[0].empty()) return misuse("uti: give one path or identifier");
  const std::string& subject = args[0];
  std::string type = subject;
  struct stat info {};
  // An existing path names a file; anything else is taken as an identifier.
  if (::lstat(subject.c_str(), &info) == 0) {
    std::optional<std::string> fileType = typeOfFile(subject);
    if (!fileType) {
      std::cerr << "corvel: uti: cannot read '" << subject << "'\n";
      return 1;
    }
    type = *fileType;
  }
  for (const std::string& line : TypeRegistry::shared().supertypes(type)) std::cout << line << '\n';
  return 0;
}

CommandRegistration reg("uti",
                        "uti PATH-OR-IDENTIFIER : the file's type (or the identifier), then every "
                        "type it conforms to",
                        &run);

}  // namespace
}  // namespace corvel::tool
