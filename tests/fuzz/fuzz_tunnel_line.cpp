// Feeds arbitrary lines to the tunnel's receiving side.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "control/tunnel/message_cipher.h"
#include "support/base64.h"
#include "support/heap_ptr.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static constexpr unsigned char kKey[16] = {1, 2, 3};
  static constexpr unsigned char kVector[16] = {4, 5, 6};
  // As it is, as the Base64 text of what it is, and as a message of our own.
  const std::string line(reinterpret_cast<const char*>(data), size);
  const lmx::heap_ptr<char> text(lmx::lmp_encode_base64(data, size, nullptr));
  for (const std::string& received : {line, std::string(text.get())}) {
    std::uint32_t length = 0;
    const lmx::heap_ptr<unsigned char> plaintext(lmx::agent_decrypt_message(
        kVector, kKey, received.c_str(), static_cast<std::uint32_t>(received.size()), &length));
    if (plaintext && plaintext.get()[std::max<std::size_t>(length, 32)] != 0) std::abort();
  }
  const lmx::heap_ptr<char> own(
      lmx::agent_encrypt_message(kVector, kKey, data, static_cast<std::uint32_t>(size), nullptr));
  std::uint32_t length = 0;
  const lmx::heap_ptr<unsigned char> back(lmx::agent_decrypt_message(kVector, kKey, own.get(), 0, &length));
  if (!back || length != size || !std::equal(data, data + size, back.get())) std::abort();
  return 0;
}
