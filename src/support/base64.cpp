// Base64 by table, both ways.
#include "support/base64.h"

#include <array>
#include <cstdint>
#include <cstring>

#include "support/heap_ptr.h"

namespace lmx {
namespace {

constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr std::uint8_t kNotInAlphabet = 0xFF;

constexpr std::array<std::uint8_t, 256> reverseAlphabet() {
  std::array<std::uint8_t, 256> table{};
  table.fill(kNotInAlphabet);
  for (std::uint8_t i = 0; i < 64; ++i) table[static_cast<unsigned char>(kAlphabet[i])] = i;
  return table;
}
constexpr auto kReverse = reverseAlphabet();

/// The number of "=" at the end of a text whose length is a multiple of four.
std::size_t paddingOf(const char* text, std::size_t length) {
  if (length == 0 || text[length - 1] != '=') return 0;
  return text[length - 2] == '=' ? 2 : 1;
}

bool allInAlphabet(const char* text, std::size_t length) {
  for (std::size_t i = 0; i < length; ++i) {
    if (kReverse[static_cast<unsigned char>(text[i])] == kNotInAlphabet) return false;
  }
  return true;
}

}  // namespace

char* lmp_encode_base64(const void* bytes, std::size_t length, std::size_t* textLength) {
  if ((bytes == nullptr && length != 0) || length > SIZE_MAX / 2) return nullptr;
  const std::size_t size = (length + 2) / 3 * 4;
  heap_ptr<char> text(static_cast<char*>(std::malloc(size + 1)));
  if (!text) return nullptr;
  const auto* in = static_cast<const std::uint8_t*>(bytes);
  char* out = text.get();
  for (std::size_t i = 0; i < length; i += 3) {
    const std::size_t left = length - i;
    std::uint32_t group = static_cast<std::uint32_t>(in[i]) << 16;
    if (left > 1) group |= static_cast<std::uint32_t>(in[i + 1]) << 8;
    if (left > 2) group |= in[i + 2];
    *out++ = kAlphabet[group >> 18];
    *out++ = kAlphabet[(group >> 12) & 63];
    *out++ = left > 1 ? kAlphabet[(group >> 6) & 63] : '=';
    *out++ = left > 2 ? kAlphabet[group & 63] : '=';
  }
  *out = '\0';
  if (textLength != nullptr) *textLength = size;
  return text.release();
}

unsigned char* lmp_decode_base64(const char* text, std::size_t* length) {
  if (text == nullptr) return nullptr;
  const std::size_t textLength = std::strlen(text);
  if (textLength % 4 != 0) return nullptr;
  const std::size_t padding = paddingOf(text, textLength);
  const std::size_t digits = textLength - padding;
  if (!allInAlphabet(text, digits)) return nullptr;

  const std::size_t size = textLength / 4 * 3 - padding;
  heap_ptr<unsigned char> bytes(static_cast<unsigned char*>(std::malloc(size + 1)));
  if (!bytes) return nullptr;
  std::uint32_t group = 0;
  std::size_t written = 0;
  for (std::size_t i = 0; i < digits; ++i) {
    group = (group << 6) | kReverse[static_cast<unsigned char>(text[i])];
    // Of each group of four digits, every digit but the first completes a byte.
    if (i % 4 == 0) continue;
    const unsigned spare = 6 - 2 * static_cast<unsigned>(i % 4);
    bytes.get()[written++] = static_cast<unsigned char>(group >> spare);
  }
  bytes.get()[size] = 0;
  if (length != nullptr) *length = size;
  return bytes.release();
}

}  // namespace lmx
