// Internal: the pieces of an atomic write, for writers that produce a file (or a folder)
// themselves and then put it in place the way writeFileAtomically does.
#pragma once

#include <string>

namespace corvel::detail {

// A fresh hidden name beside `path` (".name.XXXXXXXXn" in the same folder, so a rename
// to `path` never crosses file systems); `attempt` varies it after a collision.
std::string uniqueSibling(const std::string& path, int attempt);
// Creates and opens for writing a new file under such a name, with the permissions an
// ordinary write would give (0666 less the umask; the umask is never changed). Returns
// the descriptor and sets *temporary, or -1 when no file can be made.
int createSiblingFile(const std::string& path, std::string* temporary);
// Renames the finished, flushed `temporary` over `path` and flushes the folder. On a
// failed rename the temporary file is removed and `path` is left as it was.
bool replaceWithSibling(const std::string& temporary, const std::string& path);

}  // namespace corvel::detail
