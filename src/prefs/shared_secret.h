// The secret that the agent shares with its server.
#pragma once
#include <string>

#include "model/agent_settings.h"
#include "support/result.h"

namespace lmx {

/// Reads the secret shared with `server_uuid` from its file.
/// @return the secret or an error; an empty error message means that the text in the file is not the Base64
/// form of 16 bytes
Result<ServerSettings::Secret> readSharedSecret(const std::string& server_uuid);

}  // namespace lmx
