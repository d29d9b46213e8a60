// Table-driven Base64 encoding and decoding.
#include "support/base64.h"

#include <algorithm>
#include <array>
#include <cstdint>

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
std::size_t paddingOf(std::string_view text) {
  if (!text.ends_with('=')) return 0;
  return text.ends_with("==") ? 2 : 1;
}

bool allInAlphabet(std::string_view text) {
  return std::all_of(text.begin(), text.end(),
                     [](char c) { return kReverse[static_cast<unsigned char>(c)] != kNotInAlphabet; });
}

}  // namespace

std::string lmp_encode_base64(std::string_view bytes) {
  std::string text;
  text.reserve((bytes.size() + 2) / 3 * 4);
  const auto byte = [&bytes](std::size_t i) {
    return static_cast<std::uint32_t>(static_cast<unsigned char>(bytes[i]));
  };
  for (std::size_t i = 0; i < bytes.size(); i += 3) {
    const std::size_t left = bytes.size() - i;
    std::uint32_t group = byte(i) << 16;
    if (left > 1) group |= byte(i + 1) << 8;
    if (left > 2) group |= byte(i + 2);
    text += kAlphabet[group >> 18];
    text += kAlphabet[(group >> 12) & 63];
    text += left > 1 ? kAlphabet[(group >> 6) & 63] : '=';
    text += left > 2 ? kAlphabet[group & 63] : '=';
  }
  return text;
}

std::optional<std::string> lmp_decode_base64(std::string_view text) {
  if (text.size() % 4 != 0) return std::nullopt;
  const std::string_view digits = text.substr(0, text.size() - paddingOf(text));
  if (!allInAlphabet(digits)) return std::nullopt;

  std::string bytes;
  bytes.reserve(text.size() / 4 * 3);
  std::uint32_t group = 0;
  for (std::size_t i = 0; i < digits.size(); ++i) {
    group = (group << 6) | kReverse[static_cast<unsigned char>(digits[i])];
    // In each group of four digits, every digit but the first completes a byte.
    if (i % 4 == 0) continue;
    const unsigned spare = 6 - 2 * static_cast<unsigned>(i % 4);
    bytes += static_cast<char>(static_cast<unsigned char>(group >> spare));
  }
  return bytes;
}

}  // namespace lmx
