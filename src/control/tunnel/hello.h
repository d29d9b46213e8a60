// The line by which the agent introduces itself to the server.
#pragma once
#include <optional>
#include <string>

namespace lmx {

/// "AGENT protocol=1,…", with its line feed. Pure.
/// @param agent_uuid  the camera's
/// @param vector      the initialisation vector of the connection, in Base64
/// @param can_record  false: the agent says that it is offline
std::string helloLine(const std::optional<std::string>& agent_uuid, const std::string& vector,
                      bool can_record);

}  // namespace lmx
