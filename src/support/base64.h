// Base64 (RFC 4648, standard alphabet, padded, no line breaks).
#pragma once
#include <cstddef>

namespace lmx {

/// @param bytes   may be null when `length` is 0
/// @param textLength  gets the number of characters; may be null
/// @return NUL-terminated text in a new block that the caller frees; null on failure.
char* lmp_encode_base64(const void* bytes, std::size_t length, std::size_t* textLength);

/// @param text  NUL-terminated; anything outside the alphabet, or wrong padding, is refused
/// @param length  gets the number of bytes; may be null
/// @return the bytes in a new block that the caller frees; null when the text is not Base64.
unsigned char* lmp_decode_base64(const char* text, std::size_t* length);

}  // namespace lmx
