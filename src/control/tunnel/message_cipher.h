// Encryption of the server tunnel: AES-128-CBC with PKCS#7 padding (RFC 3602, RFC 5652), as Base64 text.
#pragma once
#include <array>
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// A key or an initialisation vector.
using CipherBlock = std::array<unsigned char, 16>;
/// Random bytes in front of every message: the vector is fixed, so they are what makes equal texts differ.
inline constexpr std::size_t kRandomPrefix = 32;

/// `count` unpredictable bytes.
std::string agent_random_bytes(std::size_t count);

/// @return Base64 text without line breaks; nothing on failure (logged)
std::optional<std::string> agent_encrypt_message(const CipherBlock& vector, const CipherBlock& key,
                                                 std::string_view plaintext);

/// @param text  Base64; line breaks at its end are skipped
/// @return the plaintext, random prefix included; nothing on failure (logged)
std::optional<std::string> agent_decrypt_message(const CipherBlock& vector, const CipherBlock& key,
                                                 std::string_view text);

/// The message in a decrypted text: what stands between the random prefix and the first NUL.
std::string messageIn(const std::string& plaintext);

}  // namespace lmx
