#include "attachments/PencilPaths.h"

#include "Corvelbase/RVPencilAttachment.h"
#include "Corvelbase/platform/Files.h"

namespace corvel::detail {

std::string identifierOfFileName(const std::string& path) {
  return deletingPathExtension(lastPathComponent(path));
}

bool hasPencilDataExtension(const std::optional<std::string>& name) {
  return name && pathExtension(*name) == RVPencilDataExtension;
}

}  // namespace corvel::detail
