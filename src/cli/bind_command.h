// The command of the camera-bind test, and the identifiers in its output. Pure.
#pragma once
#include <optional>
#include <string>
#include <vector>

namespace lmx {

/// How many bytes of the tool's output are examined.
inline constexpr std::size_t kBindOutputLimit = 264;

/// "/usr/bin/lumex --bind Fake-Camera -u USER -s SERVER", truncated after 255 bytes, as the tool's argument
/// vector. No shell splits the words, so a name may contain anything.
std::vector<std::string> bindCommand(const std::string& user, const std::string& server);

struct BoundCamera {
  std::string cameraUUID;
  std::string serverUUID;
};

/// Finds both identifiers, 36 characters each, at offsets 19 and 66 from the start of "Successfully bound ".
/// Nothing when that text is missing or an identifier is truncated.
std::optional<BoundCamera> boundCamera(const std::string& output);

}  // namespace lmx
