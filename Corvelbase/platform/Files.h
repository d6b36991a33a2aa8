// Files: whole-file reads, atomic writes, the user's caches directory and UUID text.
#pragma once

#include <optional>
#include <string>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// The whole file, or nullopt when it cannot be read (missing, a directory, no access).
CORVEL_EXPORT std::optional<Data> readFile(const std::string& path);

// Writes `bytes` to a temporary file in the same directory, flushes it and renames it
// over `path`, so a reader sees the old file or the new one, never a part. Returns false
// (and leaves any old file untouched) on any failure.
CORVEL_EXPORT bool writeFileAtomically(const std::string& path, const std::uint8_t* bytes,
                                       std::size_t size);
inline bool writeFileAtomically(const std::string& path, const Data& bytes) {
  return writeFileAtomically(path, bytes.data(), bytes.size());
}

// The user's caches directory (see PlatformRegistry::setCachesDirectory), created with
// its parents when missing. Empty when it cannot be determined or created.
CORVEL_EXPORT std::string cachesDirectory();

// A new random UUID in the canonical text form: 36 upper-case hexadecimal characters in
// 8-4-4-4-12 groups.
CORVEL_EXPORT std::string makeUUIDString();

}  // namespace corvel
