// Checks the parameters of a START.
#include "control/handlers/start_parameters.h"

#include <algorithm>
#include <climits>
#include <string_view>

#include "model/metadata_keys.h"
#include "platform/paths.h"

namespace lmx {
namespace {

std::string identifierProblem(const std::string& identifier) {
  const std::string key = metadata_key::kRecordingUUID;
  if (identifier.empty()) return key + " names the movie and must not be empty";
  if (identifier.find('/') != std::string::npos) return key + " names the movie and must not hold a \"/\"";
  if (identifier == "." || identifier == "..") return key + " names the movie and must not be a directory's";
  if (identifier.size() <= kLongestRecordingName) return {};
  return key + " names the movie and must not be longer than " + std::to_string(kLongestRecordingName) +
         " bytes; it has " + std::to_string(identifier.size());
}

/// Whether every part of `path` is short enough, with room for what the agent adds to the last one.
bool namesFit(std::string_view path) {
  for (std::size_t from = 0; from < path.size();) {
    const std::size_t to = std::min(path.find('/', from), path.size());
    if (to - from > (to == path.size() ? kLongestRecordingName : std::size_t{NAME_MAX})) return false;
    from = to + 1;
  }
  return path.size() < PATH_MAX - NAME_MAX;
}

std::string pathProblem(const std::string& path) {
  const std::string key = metadata_key::kAdHocFilePath;
  if (path.empty() || path.ends_with('/')) return key + " must name a file";
  return namesFit(path) ? "" : key + " is too long";
}

}  // namespace

StartCheck checkStart(const Dictionary* parameters) {
  const auto identifier = lookUp(parameters, metadata_key::kRecordingUUID);
  if (!identifier || !lookUp(parameters, metadata_key::kMaxRecordingMinutes) ||
      !lookUp(parameters, metadata_key::kUnattendedMinutes)) {
    return {};
  }
  StartCheck check{.accepted = true, .problem = identifierProblem(*identifier)};
  if (const auto path = lookUp(parameters, metadata_key::kAdHocFilePath); path && check.problem.empty())
    check.problem = pathProblem(*path);
  check.accepted = check.problem.empty();
  return check;
}

}  // namespace lmx
