// Base64 (RFC 4648, standard alphabet, padded, no line breaks).
#pragma once
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// Text of `bytes`.
std::string lmp_encode_base64(std::string_view bytes);

/// Bytes of `text`; nothing when it holds anything outside the alphabet or wrong padding.
std::optional<std::string> lmp_decode_base64(std::string_view text);

}  // namespace lmx
