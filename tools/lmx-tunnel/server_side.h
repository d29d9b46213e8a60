// The server's side of the tunnel, as far as a person who sets up or debugs an agent needs it. Pure.
#pragma once
#include <optional>
#include <string>
#include <vector>

#include "control/tunnel/message_cipher.h"
#include "support/result.h"

namespace lmx {

/// What an agent says in clear.
struct AgentHello {
  std::string agentUUID;
  std::string version;
  CipherBlock vector{};
  bool offline = false;
};

/// @param line  without its line feed. @return nothing when it is no hello of protocol 1
std::optional<AgentHello> parseHello(const std::string& line);

/// Encrypts and decrypts the lines of one connection.
class TunnelCipher {
 public:
  TunnelCipher(const CipherBlock& secret, const CipherBlock& vector) : secret_(secret), vector_(vector) {}

  /// The line on the wire for a command, with its line feed; nothing when memory fails.
  [[nodiscard]] std::optional<std::string> encrypted(const std::string& command) const;
  /// The text of a line; nothing when it does not decrypt.
  [[nodiscard]] std::optional<std::string> decrypted(const std::string& line) const;

 private:
  CipherBlock secret_;
  CipherBlock vector_;
};

/// The JPEG picture in a reply to STATUS; nothing when there is none.
std::optional<std::string> previewIn(const std::string& reply);

/// `reply` with its picture replaced by its size, for a terminal.
std::string shortened(const std::string& reply);

/// Whether the agent answers a command of that text.
bool getsReply(const std::string& command);

/// The 16 bytes under "lmx_secret" in the property list `path`. The error doesn't name the path.
Result<CipherBlock> readSecret(const std::string& path);

}  // namespace lmx
