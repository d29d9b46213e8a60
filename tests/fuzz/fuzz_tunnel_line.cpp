// Feeds arbitrary lines to the tunnel's receiving side.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "control/tunnel/message_cipher.h"
#include "support/base64.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static constexpr lmx::CipherBlock kKey = {1, 2, 3};
  static constexpr lmx::CipherBlock kVector = {4, 5, 6};
  // As it is, as the Base64 text of what it is, and as a message of our own.
  const std::string line(reinterpret_cast<const char*>(data), size);
  for (const std::string& received : {line, lmx::lmp_encode_base64(line)}) {
    if (const auto plaintext = lmx::agent_decrypt_message(kVector, kKey, received))
      lmx::messageIn(*plaintext);
  }
  const auto own = lmx::agent_encrypt_message(kVector, kKey, line);
  if (!own || lmx::agent_decrypt_message(kVector, kKey, *own) != line) std::abort();
  return 0;
}
