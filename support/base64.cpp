// Base64 by hand: a strict decoder is shorter than the work-arounds for lenient ones.
#include "support/base64.h"

#include <cstdlib>
#include <cstring>

namespace lmx {
namespace {

constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

int valueOf(char c) {
  const void* at = c == '\0' ? nullptr : std::memchr(kAlphabet, c, 64);
  return at == nullptr ? -1 : static_cast<int>(static_cast<const char*>(at) - kAlphabet);
}

}  // namespace

char* lmp_encode_base64(const void* bytes, std::size_t length, std::size_t* textLength) {
  const std::size_t size = (length + 2) / 3 * 4;
  auto* text = static_cast<char*>(std::malloc(size + 1));
  if (text == nullptr) return nullptr;
  const auto* in = static_cast<const unsigned char*>(bytes);
  char* out = text;
  for (std::size_t i = 0; i < length; i += 3) {
    const std::size_t left = length - i;
    const unsigned group = static_cast<unsigned>(in[i]) << 16 |
                           (left > 1 ? static_cast<unsigned>(in[i + 1]) << 8 : 0U) |
                           (left > 2 ? in[i + 2] : 0U);
    *out++ = kAlphabet[group >> 18];
    *out++ = kAlphabet[group >> 12 & 63];
    *out++ = left > 1 ? kAlphabet[group >> 6 & 63] : '=';
    *out++ = left > 2 ? kAlphabet[group & 63] : '=';
  }
  *out = '\0';
  if (textLength != nullptr) *textLength = size;
  return text;
}

unsigned char* lmp_decode_base64(const char* text, std::size_t* length) {
  const std::size_t size = text == nullptr ? 1 : std::strlen(text);
  if (size % 4 != 0) return nullptr;
  std::size_t padding = 0;
  while (padding < 2 && padding < size && text[size - 1 - padding] == '=') ++padding;
  const std::size_t count = size / 4 * 3 - padding;
  auto* bytes = static_cast<unsigned char*>(std::malloc(count + 3));
  if (bytes == nullptr) return nullptr;
  for (std::size_t i = 0; i < size; i += 4) {
    unsigned group = 0;
    for (std::size_t k = 0; k < 4; ++k) {
      const bool pad = i + k >= size - padding;
      const int value = pad ? 0 : valueOf(text[i + k]);
      if (value < 0) {
        std::free(bytes);
        return nullptr;
      }
      group = group << 6 | static_cast<unsigned>(value);
    }
    unsigned char* out = bytes + i / 4 * 3;
    out[0] = static_cast<unsigned char>(group >> 16);
    out[1] = static_cast<unsigned char>(group >> 8 & 0xFF);
    out[2] = static_cast<unsigned char>(group & 0xFF);
  }
  if (length != nullptr) *length = count;
  return bytes;
}

}  // namespace lmx
