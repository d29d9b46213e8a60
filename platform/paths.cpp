// Fixed paths behind the trial directory.
#include "platform/paths.h"

#include <cstdlib>

namespace lmx {

std::string systemPath(std::string_view fixedPath) {
  static const auto* root = new std::string([] {
    const char* value = std::getenv("LMXAGENTD_ROOT");
    std::string text = value == nullptr ? "" : value;
    while (!text.empty() && text.back() == '/') text.pop_back();
    return text;
  }());
  return *root + std::string(fixedPath);
}

std::string directoryOf(std::string_view path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string_view::npos) return ".";
  return slash == 0 ? "/" : std::string(path.substr(0, slash));
}

}  // namespace lmx
