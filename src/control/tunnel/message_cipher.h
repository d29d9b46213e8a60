// Encryption of the server tunnel: AES-128-CBC with PKCS#7 padding (RFC 3602, RFC 5652), as Base64 text.
#pragma once
#include <cstddef>
#include <cstdint>

namespace lmx {

/// Bytes of key and of initialisation vector.
inline constexpr std::size_t kCipherBlock = 16;
/// Random bytes in front of every message: the vector is fixed, so they are what makes equal texts differ.
inline constexpr std::size_t kRandomPrefix = 32;

/// `count` unpredictable bytes in a new block that the caller frees; null when memory fails. 0 gives an empty
/// block.
unsigned char* agent_random_bytes(std::uint32_t count);

/// @param vector, key  16 bytes each
/// @param resultLength  gets the number of characters, 0 on failure
/// @return Base64 text without line breaks, NUL-terminated, in a new block that the caller frees; null on
/// failure (logged)
char* agent_encrypt_message(const unsigned char* vector, const unsigned char* key, const void* plaintext,
                            std::uint32_t length, std::uint64_t* resultLength);

/// @param text  NUL-terminated Base64; line breaks at its end are skipped
/// @param resultLength  gets the plaintext's bytes, 0 on failure
/// @return the plaintext, random prefix included, at least 33 bytes and zero beyond its end, in a new block
/// that the caller frees; null on failure (logged)
unsigned char* agent_decrypt_message(const unsigned char* vector, const unsigned char* key, const char* text,
                                     std::uint32_t length, std::uint32_t* resultLength);

}  // namespace lmx
