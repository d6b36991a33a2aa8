// Naming drawings by file: the identifier a drawing's files share, and the drawing file's
// extension test.
#pragma once

#include <optional>
#include <string>

namespace corvel::detail {

// The identifier of a file name: its last component without its extension
// ("/x/ABC.jpeg" gives "ABC", "a.b.c" gives "a.b", ".hidden" stays ".hidden").
std::string identifierOfFileName(const std::string& path);
// Whether `name` has the exact extension "pencildata" (case matters).
bool hasPencilDataExtension(const std::optional<std::string>& name);

}  // namespace corvel::detail
