// Builds the bind command and extracts identifiers from its output.
#include "cli/bind_command.h"

namespace lmx {
namespace {

constexpr std::size_t kCommandLimit = 255;
constexpr std::size_t kUUIDLength = 36;
constexpr std::size_t kCameraAt = 19;
constexpr std::size_t kServerAt = 66;

}  // namespace

std::vector<std::string> bindCommand(const std::string& user, const std::string& server) {
  std::vector<std::string> words;
  std::size_t used = 0;
  for (const std::string& word :
       {std::string("/usr/bin/lumex"), std::string("--bind"), std::string("Fake-Camera"), std::string("-u"),
        user, std::string("-s"), server}) {
    if (used >= kCommandLimit) break;
    words.push_back(word.substr(0, kCommandLimit - used));
    used += word.size() + 1;
  }
  return words;
}

std::optional<BoundCamera> boundCamera(const std::string& output) {
  const std::size_t found = output.find("Successfully bound ");
  if (found == std::string::npos || output.size() < found + kServerAt + kUUIDLength) return std::nullopt;
  return BoundCamera{output.substr(found + kCameraAt, kUUIDLength),
                     output.substr(found + kServerAt, kUUIDLength)};
}

}  // namespace lmx
