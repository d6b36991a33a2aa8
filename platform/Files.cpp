#include "Corvelbase/platform/Files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <uuid/uuid.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "Corvelbase/platform/Platform.h"

namespace corvel {

std::optional<Data> readFile(const std::string& path) {
  std::error_code ec;
  if (!std::filesystem::is_regular_file(path, ec)) return std::nullopt;
  std::ifstream in(path, std::ios::binary);
  if (!in) return std::nullopt;
  Data bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  if (in.bad()) return std::nullopt;
  return bytes;
}

bool writeFileAtomically(const std::string& path, const std::uint8_t* bytes, std::size_t size) {
  std::filesystem::path target(path);
  std::filesystem::path dir = target.parent_path();
  if (dir.empty()) dir = ".";
  // Appended piece by piece: GCC 12 at -O3 misreads "." + string + "..." (-Wrestrict).
  std::string name = ".";
  name.append(target.filename().string()).append(".XXXXXX");
  std::string pattern = (dir / name).string();
  int fd = mkstemp(pattern.data());
  if (fd < 0) return false;
  bool ok = true;
  std::size_t written = 0;
  while (ok && written < size) {
    ssize_t n = ::write(fd, bytes + written, size - written);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0)
      ok = false;
    else
      written += static_cast<std::size_t>(n);
  }
  // mkstemp creates 0600; give the file the permissions an ordinary write would.
  mode_t mask = umask(0);
  umask(mask);
  if (ok) ok = fchmod(fd, 0666 & ~mask) == 0;
  if (ok) ok = fsync(fd) == 0;
  if (::close(fd) != 0) ok = false;
  if (ok) ok = std::rename(pattern.c_str(), path.c_str()) == 0;
  if (!ok) ::unlink(pattern.c_str());
  return ok;
}

std::string cachesDirectory() {
  std::string dir;
  if (auto override = PlatformRegistry::cachesDirectoryOverride()) {
    dir = *override;
  } else {
    const char* xdg = std::getenv("XDG_CACHE_HOME");
    if (xdg && xdg[0] == '/') {
      dir = xdg;
    } else {
      const char* home = std::getenv("HOME");
      if (!home || !home[0]) return {};
      dir = std::string(home) + "/.cache";
    }
  }
  std::error_code ec;
  std::filesystem::create_directories(dir, ec);
  if (!std::filesystem::is_directory(dir, ec)) return {};
  return dir;
}

std::string makeUUIDString() {
  uuid_t uuid;
  uuid_generate_random(uuid);
  char text[37];
  uuid_unparse_upper(uuid, text);
  return text;
}

}  // namespace corvel
