// The secret that the agent shares with its server.
#pragma once
#include <string>

#include "model/agent_settings.h"
#include "support/result.h"

namespace lmx {

/// Why there is no secret. The message names the file and never quotes from it.
struct SecretError {
  enum class Kind {
    missing,   ///< no such file, or it has no secret
    unusable,  ///< its text is not the Base64 form of 16 bytes
  };
  Kind kind = Kind::missing;
  std::string message;
};

/// The path of the file with the secret shared with `server_uuid`.
std::string sharedSecretFile(const std::string& server_uuid);

/// Reads the secret shared with `server_uuid` from its file. White space around the text is ignored: people
/// paste it with the line feed that their shell has added. While the file can't be read for a passing reason,
/// the secret is the one last read.
Result<ServerSettings::Secret, SecretError> readSharedSecret(const std::string& server_uuid);

}  // namespace lmx
