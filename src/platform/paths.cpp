// Prefixes the system's fixed paths with the private root directory, if there is one.
#include "platform/paths.h"

#include <cstdlib>
#include <memory>

namespace lmx {
namespace {

std::string readRoot() {
  const char* value = std::getenv("LMXAGENTD_ROOT");
  std::string root = value != nullptr ? value : "";
  while (!root.empty() && root.back() == '/') root.pop_back();
  return root;
}

}  // namespace

std::string systemPath(std::string_view fixedPath) {
  // Never destroyed: threads that outlive main's statics still log, and logging needs paths.
  static const std::string& root = *std::make_unique<std::string>(readRoot()).release();
  return root + std::string(fixedPath);
}

std::string documentPathOf(const std::string& movie) {
  std::string path = movie;
  bool replaced = false;
  for (std::size_t at = path.find(".mov"); at != std::string::npos; at = path.find(".mov", at + 4)) {
    path.replace(at, 4, ".xml");
    replaced = true;
  }
  return replaced ? path : path + ".xml";
}

std::string directoryOf(std::string_view path) {
  const auto slash = path.rfind('/');
  if (slash == std::string_view::npos) return ".";
  return slash == 0 ? "/" : std::string(path.substr(0, slash));
}

}  // namespace lmx
