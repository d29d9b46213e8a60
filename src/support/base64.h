// Base64 (RFC 4648, standard alphabet, padded, no line breaks).
#pragma once
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// Encodes `bytes`.
std::string lmp_encode_base64(std::string_view bytes);

/// Decodes `text`; nothing when it contains characters outside the alphabet or has wrong padding.
std::optional<std::string> lmp_decode_base64(std::string_view text);

}  // namespace lmx
