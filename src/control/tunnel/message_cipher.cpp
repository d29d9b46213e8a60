// The tunnel's cipher through OpenSSL's EVP interface.
#include "control/tunnel/message_cipher.h"

#include <openssl/err.h>
#include <openssl/evp.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <memory>
#include <string>
#include <string_view>

#include "platform/log.h"
#include "support/base64.h"
#include "support/heap_ptr.h"

namespace lmx {
namespace {

constexpr const char* kEncryptionFailed = "Internal error occurred";
constexpr const char* kDecryptionFailed = "Internal error occurred during decryption";
constexpr std::size_t kRoomForPadding = 32;

struct ContextDeleter {
  void operator()(EVP_CIPHER_CTX* context) const { EVP_CIPHER_CTX_free(context); }
};
using CipherContext = std::unique_ptr<EVP_CIPHER_CTX, ContextDeleter>;

std::nullptr_t fail(const char* message) {
  LMPLogMessage(nullptr, kLogCritical, "%s", message);
  return nullptr;
}

enum class Direction : int { decrypt = 0, encrypt = 1 };

/// Runs all of `input` through the cipher; `output` has room for it and two blocks more.
/// @return bytes written, negative on failure
int runCipher(Direction direction, const unsigned char* vector, const unsigned char* key, const void* input,
              std::size_t length, unsigned char* output) {
  const CipherContext context(EVP_CIPHER_CTX_new());
  int updated = 0;
  int finished = 0;
  if (context && length <= static_cast<std::size_t>(std::numeric_limits<int>::max()) - kRoomForPadding &&
      EVP_CipherInit_ex(context.get(), EVP_aes_128_cbc(), nullptr, key, vector,
                        static_cast<int>(direction)) == 1 &&
      EVP_CipherUpdate(context.get(), output, &updated, static_cast<const unsigned char*>(input),
                       static_cast<int>(length)) == 1 &&
      EVP_CipherFinal_ex(context.get(), output + updated, &finished) == 1) {
    return updated + finished;
  }
  ERR_print_errors_fp(stdout);
  return -1;
}

heap_ptr<unsigned char> zeroed(std::size_t size) {
  return heap_ptr<unsigned char>(static_cast<unsigned char*>(std::calloc(1, size)));
}

}  // namespace

unsigned char* agent_random_bytes(std::uint32_t count) {
  auto* bytes = static_cast<unsigned char*>(std::malloc(count == 0 ? 1 : count));
  if (bytes == nullptr) return nullptr;
  for (std::uint32_t i = 0; i < count; ++i) bytes[i] = static_cast<unsigned char>(arc4random());
  return bytes;
}

char* agent_encrypt_message(const unsigned char* vector, const unsigned char* key, const void* plaintext,
                            std::uint32_t length, std::uint64_t* resultLength) {
  if (resultLength != nullptr) *resultLength = 0;
  const auto ciphertext = zeroed(std::size_t{length} + kRoomForPadding);
  if (!ciphertext) return fail(kEncryptionFailed);
  const int size = runCipher(Direction::encrypt, vector, key, plaintext, length, ciphertext.get());
  if (size < 0) return fail(kEncryptionFailed);
  std::size_t characters = 0;
  char* text = lmp_encode_base64(ciphertext.get(), static_cast<std::size_t>(size), &characters);
  if (text == nullptr) return fail(kEncryptionFailed);
  if (resultLength != nullptr) *resultLength = characters;
  return text;
}

unsigned char* agent_decrypt_message(const unsigned char* vector, const unsigned char* key, const char* text,
                                     std::uint32_t /*length*/, std::uint32_t* resultLength) {
  if (resultLength != nullptr) *resultLength = 0;
  std::string_view line(text);
  while (line.ends_with('\n') || line.ends_with('\r')) line.remove_suffix(1);
  std::size_t size = 0;
  const heap_ptr<unsigned char> ciphertext(lmp_decode_base64(std::string(line).c_str(), &size));
  if (!ciphertext) return fail(kDecryptionFailed);
  auto plaintext = zeroed(size + kRoomForPadding + 1);
  if (!plaintext) return fail(kDecryptionFailed);
  const int written = runCipher(Direction::decrypt, vector, key, ciphertext.get(), size, plaintext.get());
  if (written < 0) return fail(kDecryptionFailed);
  // The cipher may have left padding behind the end.
  std::fill(plaintext.get() + written, plaintext.get() + size + kRoomForPadding + 1,
            static_cast<unsigned char>(0));
  if (resultLength != nullptr) *resultLength = static_cast<std::uint32_t>(written);
  return plaintext.release();
}

}  // namespace lmx
