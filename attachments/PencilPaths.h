// Path pieces as the platform's string methods take them, for naming drawings by file.
#pragma once

#include <optional>
#include <string>

namespace corvel::pencil {

// The last component of `path`, trailing slashes ignored ("a/b.jpeg/" gives "b.jpeg"; "/"
// gives "/").
std::string lastPathComponent(const std::string& path);
// What follows the last '.' of the last component, when that dot is not the component's
// first character; "" otherwise (".pencildata" has no extension).
std::string pathExtension(const std::string& path);
// The identifier of a file name: its last component without its extension
// ("/x/ABC.jpeg" gives "ABC", "a.b.c" gives "a.b", ".hidden" stays ".hidden").
std::string identifierOfFileName(const std::string& path);
// Whether `name` has the exact extension "pencildata" (case matters).
bool hasPencilDataExtension(const std::optional<std::string>& name);

}  // namespace corvel::pencil
