// The tunnel's cipher through OpenSSL's EVP interface.
#include "control/tunnel/message_cipher.h"

#include <openssl/err.h>
#include <openssl/evp.h>

#include <cstdio>
#include <cstdlib>
#include <limits>
#include <memory>

#include "platform/log.h"
#include "support/base64.h"

namespace lmx {
namespace {

struct ContextDeleter {
  void operator()(EVP_CIPHER_CTX* context) const { EVP_CIPHER_CTX_free(context); }
};
using CipherContext = std::unique_ptr<EVP_CIPHER_CTX, ContextDeleter>;

std::nullopt_t fail(const char* message) {
  LMPLogMessage(nullptr, kLogCritical, "%s", message);
  return std::nullopt;
}

enum class Direction : int { decrypt = 0, encrypt = 1 };

/// Runs all of `input` through the cipher.
std::optional<std::string> runCipher(Direction direction, const CipherBlock& vector, const CipherBlock& key,
                                     std::string_view input) {
  constexpr std::size_t kRoomForPadding = 2 * std::tuple_size_v<CipherBlock>;
  const CipherContext context(EVP_CIPHER_CTX_new());
  std::string output(input.size() + kRoomForPadding, '\0');
  const auto bytes = [](auto* text) { return reinterpret_cast<unsigned char*>(text); };
  int updated = 0;
  int finished = 0;
  if (context && output.size() <= static_cast<std::size_t>(std::numeric_limits<int>::max()) &&
      EVP_CipherInit_ex(context.get(), EVP_aes_128_cbc(), nullptr, key.data(), vector.data(),
                        static_cast<int>(direction)) == 1 &&
      EVP_CipherUpdate(context.get(), bytes(output.data()), &updated,
                       reinterpret_cast<const unsigned char*>(input.data()),
                       static_cast<int>(input.size())) == 1 &&
      EVP_CipherFinal_ex(context.get(), bytes(output.data()) + updated, &finished) == 1) {
    output.resize(static_cast<std::size_t>(updated) + static_cast<std::size_t>(finished));
    return output;
  }
  ERR_print_errors_fp(stdout);
  return std::nullopt;
}

}  // namespace

std::string agent_random_bytes(std::size_t count) {
  std::string bytes(count, '\0');
  arc4random_buf(bytes.data(), bytes.size());
  return bytes;
}

std::optional<std::string> agent_encrypt_message(const CipherBlock& vector, const CipherBlock& key,
                                                 std::string_view plaintext) {
  const auto ciphertext = runCipher(Direction::encrypt, vector, key, plaintext);
  if (!ciphertext) return fail("Internal error occurred");
  return lmp_encode_base64(*ciphertext);
}

std::optional<std::string> agent_decrypt_message(const CipherBlock& vector, const CipherBlock& key,
                                                 std::string_view text) {
  constexpr const char* kFailed = "Internal error occurred during decryption";
  while (text.ends_with('\n') || text.ends_with('\r')) text.remove_suffix(1);
  const auto ciphertext = lmp_decode_base64(text);
  if (!ciphertext) return fail(kFailed);
  auto plaintext = runCipher(Direction::decrypt, vector, key, *ciphertext);
  if (!plaintext) return fail(kFailed);
  return plaintext;
}

std::string messageIn(const std::string& plaintext) {
  if (plaintext.size() <= kRandomPrefix) return {};
  return plaintext.c_str() + kRandomPrefix;
}

}  // namespace lmx
