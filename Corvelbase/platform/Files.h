// Files: path pieces, whole-file reads, atomic writes, the user's caches directory and
// UUID text.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// ---- Path pieces, as the desktop platform's path functions take them: trailing slashes
// are ignored ("a/b.txt/" names b.txt), and a dot that starts a name begins no extension
// (".hidden" has none). Paths are UTF-8; nothing here touches the file system.

// The last component: "/x/b.jpeg/" gives "b.jpeg", "b" gives "b", "/" gives "/", "" gives "".
CORVEL_EXPORT std::string lastPathComponent(std::string_view path);
// What follows the last '.' of the last component, when that dot is not the component's
// first character: "a.tar.gz/" gives "gz"; ".pencildata", "a." and "a" give "". Case kept.
CORVEL_EXPORT std::string pathExtension(std::string_view path);
// The path without trailing slashes and without its last component's extension and dot:
// "/x/R.pencildata/" gives "/x/R", "a.b.c" gives "a.b", ".hidden" and "/" stay as they are.
CORVEL_EXPORT std::string deletingPathExtension(std::string_view path);

// The whole file, or nullopt when it cannot be read (missing, a directory, no access).
CORVEL_EXPORT std::optional<Data> readFile(const std::string& path);

// Writes `bytes` to a temporary file in the same directory, flushes it, renames it over
// `path` and flushes the directory, so a reader sees the old file or the new one, never
// a part, and the new one survives a power cut once this returns. The file gets the
// permissions an ordinary write would give (0666 less the umask); the umask is never
// changed. Returns false (leaving any old file untouched, unless only the final flush of
// the directory failed) on any failure.
CORVEL_EXPORT bool writeFileAtomically(const std::string& path, const std::uint8_t* bytes,
                                       std::size_t size);
inline bool writeFileAtomically(const std::string& path, const Data& bytes) {
  return writeFileAtomically(path, bytes.data(), bytes.size());
}

// Flushes the entries of the directory at `path` ("" is the working directory) to disk,
// as after a rename in it. False when it cannot be opened or flushed.
CORVEL_EXPORT bool syncDirectory(const std::string& path);

// The user's caches directory (see PlatformRegistry::setCachesDirectory), created with
// its parents when missing. Empty when it cannot be determined or created.
CORVEL_EXPORT std::string cachesDirectory();

// A new random UUID in the canonical text form: 36 upper-case hexadecimal characters in
// 8-4-4-4-12 groups.
CORVEL_EXPORT std::string makeUUIDString();

}  // namespace corvel
