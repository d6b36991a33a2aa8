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
#include "platform/SiblingFiles.h"

namespace corvel {

namespace {

// The path without its trailing slashes; "/" when it is nothing but slashes.
std::string_view withoutTrailingSlashes(std::string_view path) {
  auto end = path.find_last_not_of('/');
  if (end == std::string_view::npos) return path.empty() ? path : path.substr(0, 1);
  return path.substr(0, end + 1);
}

// Where the extension's dot stands in `path` (already without trailing slashes), or npos.
std::size_t extensionDot(std::string_view path) {
  auto slash = path.rfind('/');
  std::size_t start = slash == std::string_view::npos ? 0 : slash + 1;
  auto dot = path.rfind('.');
  return dot == std::string_view::npos || dot <= start ? std::string_view::npos : dot;
}

}  // namespace

std::string lastPathComponent(std::string_view path) {
  path = withoutTrailingSlashes(path);
  if (path == "/") return std::string(path);
  auto slash = path.rfind('/');
  return std::string(slash == std::string_view::npos ? path : path.substr(slash + 1));
}

std::string pathExtension(std::string_view path) {
  path = withoutTrailingSlashes(path);
  auto dot = extensionDot(path);
  return dot == std::string_view::npos ? std::string() : std::string(path.substr(dot + 1));
}

std::string deletingPathExtension(std::string_view path) {
  path = withoutTrailingSlashes(path);
  return std::string(path.substr(0, extensionDot(path)));
}

std::optional<Data> readFile(const std::string& path) {
  std::error_code ec;
  if (!std::filesystem::is_regular_file(path, ec)) return std::nullopt;
  std::ifstream in(path, std::ios::binary);
  if (!in) return std::nullopt;
  Data bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  if (in.bad()) return std::nullopt;
  return bytes;
}

bool syncDirectory(const std::string& path) {
  int fd = ::open(path.empty() ? "." : path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return false;
  bool ok = fsync(fd) == 0;
  ::close(fd);
  return ok;
}

namespace detail {

std::string uniqueSibling(const std::string& path, int attempt) {
  std::filesystem::path target(path);
  // Appended piece by piece: GCC 12 at -O3 misreads "." + string + "..." (-Wrestrict).
  std::string name = ".";
  name.append(target.filename().string()).append(".").append(makeUUIDString(), 0, 8);
  name.append(std::to_string(attempt));
  return (target.parent_path() / name).string();
}

int createSiblingFile(const std::string& path, std::string* temporary) {
  // Created with 0666 so that open applies the process's umask (and a directory's default
  // ACL), as an ordinary write would: asking umask for the mask would change it for every
  // thread in between.
  for (int attempt = 0; attempt < 16; ++attempt) {
    *temporary = uniqueSibling(path, attempt);
    int fd = ::open(temporary->c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    if (fd >= 0 || errno != EEXIST) return fd;
  }
  return -1;
}

bool replaceWithSibling(const std::string& temporary, const std::string& path) {
  if (std::rename(temporary.c_str(), path.c_str()) != 0) {
    ::unlink(temporary.c_str());
    return false;
  }
  // The new name lives in the directory: without this it may be gone after a power cut.
  return syncDirectory(std::filesystem::path(path).parent_path().string());
}

}  // namespace detail

bool writeFileAtomically(const std::string& path, const std::uint8_t* bytes, std::size_t size) {
  std::string temporary;
  int fd = detail::createSiblingFile(path, &temporary);
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
  if (ok) ok = fsync(fd) == 0;
  if (::close(fd) != 0) ok = false;
  if (!ok) {
    ::unlink(temporary.c_str());
    return false;
  }
  return detail::replaceWithSibling(temporary, path);
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
