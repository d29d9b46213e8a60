// The camera-bind test's command and what is read out of its answer. Pure.
#pragma once
#include <optional>
#include <string>
#include <vector>

namespace lmx {

/// Bytes of the tool's output that are looked at.
inline constexpr std::size_t kBindOutputLimit = 264;

/// "/usr/bin/lumex --bind Fake-Camera -u USER -s SERVER", cut after 255 bytes, as the words that the tool
/// gets: a name is one word whatever it holds, since no shell reads it.
std::vector<std::string> bindCommand(const std::string& user, const std::string& server);

struct BoundCamera {
  std::string cameraUUID;
  std::string serverUUID;
};

/// Finds both identifiers, 36 characters each, 19 and 66 characters behind the beginning of "Successfully
/// bound ". Nothing when that is absent or an identifier is cut off.
std::optional<BoundCamera> boundCamera(const std::string& output);

}  // namespace lmx
