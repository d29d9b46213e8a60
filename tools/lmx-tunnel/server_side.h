// The server's side of the tunnel, limited to what is needed to set up or debug an agent. Pure.
#pragma once
#include <optional>
#include <string>
#include <vector>

#include "control/tunnel/message_cipher.h"
#include "support/result.h"

namespace lmx {

/// What an agent sends unencrypted.
struct AgentHello {
  std::string agentUUID;
  std::string version;
  CipherBlock vector{};
  bool offline = false;
};

/// @param line  without its line feed
/// @return nothing when it is not a hello of protocol 1
std::optional<AgentHello> parseHello(const std::string& line);

/// Encrypts and decrypts the lines of one connection.
class TunnelCipher {
 public:
  TunnelCipher(const CipherBlock& secret, const CipherBlock& vector) : secret_(secret), vector_(vector) {}

  /// The encrypted line for a command, with its line feed; nothing when out of memory.
  [[nodiscard]] std::optional<std::string> encrypted(const std::string& command) const;
  /// The decrypted text of a line; nothing when it can't be decrypted.
  [[nodiscard]] std::optional<std::string> decrypted(const std::string& line) const;

 private:
  CipherBlock secret_;
  CipherBlock vector_;
};

/// The JPEG image in a reply to STATUS; nothing when there is none.
std::optional<std::string> previewIn(const std::string& reply);

/// `reply` with its image replaced by the image's size, for display on a terminal.
std::string shortened(const std::string& reply);

/// Whether the agent replies to this command.
bool getsReply(const std::string& command);

/// The 16 bytes under "lmx_secret" in the property list `path`. The error doesn't name the path.
Result<CipherBlock> readSecret(const std::string& path);

}  // namespace lmx
