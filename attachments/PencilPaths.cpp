#include "attachments/PencilPaths.h"

#include "Corvelbase/RVPencilAttachment.h"

namespace corvel::pencil {

std::string lastPathComponent(const std::string& path) {
  auto end = path.find_last_not_of('/');
  if (end == std::string::npos) return path.empty() ? "" : "/";
  auto slash = path.rfind('/', end);
  std::size_t start = slash == std::string::npos ? 0 : slash + 1;
  return path.substr(start, end + 1 - start);
}

std::string pathExtension(const std::string& path) {
  std::string name = lastPathComponent(path);
  auto dot = name.rfind('.');
  if (dot == std::string::npos || dot == 0) return {};
  return name.substr(dot + 1);
}

std::string identifierOfFileName(const std::string& path) {
  std::string name = lastPathComponent(path);
  auto dot = name.rfind('.');
  return dot == std::string::npos || dot == 0 ? name : name.substr(0, dot);
}

bool hasPencilDataExtension(const std::optional<std::string>& name) {
  return name && pathExtension(*name) == RVPencilDataExtension;
}

}  // namespace corvel::pencil
