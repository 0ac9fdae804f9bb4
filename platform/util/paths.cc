#include "platform/util/paths.h"

#include <cstdlib>

namespace Groundwork {

std::string RootDir() {
  const char* root = std::getenv("ZYRD_ROOT");
  return root != nullptr && *root != '\0' ? std::string(root) : std::string("/");
}

std::string RootPath(std::string_view absolute) {
  std::string root = RootDir();
  while (root.size() > 1 && root.back() == '/') root.pop_back();
  while (!absolute.empty() && absolute.front() == '/') absolute.remove_prefix(1);
  if (root == "/") return "/" + std::string(absolute);
  return root + "/" + std::string(absolute);
}

}  // namespace Groundwork
