// Checks UTF-8 and XML characters.
#include "support/utf8.h"

#include <algorithm>

namespace lmx {
namespace {

constexpr bool isContinuation(unsigned char byte) { return (byte & 0xC0) == 0x80; }

/// What a lead byte says: the length of its sequence in bytes (0: not a lead byte) and the range of the
/// second byte.
struct Sequence {
  std::size_t length = 0;
  unsigned char second_from = 0x80;
  unsigned char second_to = 0xBF;
};

constexpr Sequence sequenceOf(unsigned char lead) {
  if (lead < 0x80) return {1};
  if (lead < 0xC2) return {0};
  if (lead < 0xE0) return {2};
  if (lead == 0xE0) return {3, 0xA0, 0xBF};
  if (lead == 0xED) return {3, 0x80, 0x9F};
  if (lead < 0xF0) return {3};
  if (lead == 0xF0) return {4, 0x90, 0xBF};
  if (lead < 0xF4) return {4};
  if (lead == 0xF4) return {4, 0x80, 0x8F};
  return {0};
}

}  // namespace

std::size_t utf8CharacterLength(std::string_view text) {
  if (text.empty()) return 0;
  const auto at = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
  const Sequence sequence = sequenceOf(at(0));
  if (sequence.length > text.size()) return 0;
  if (sequence.length > 1 && (at(1) < sequence.second_from || at(1) > sequence.second_to)) return 0;
  for (std::size_t i = 2; i < sequence.length; ++i) {
    if (!isContinuation(at(i))) return 0;
  }
  return sequence.length;
}

std::size_t xmlCharacterLength(std::string_view text) {
  const std::size_t length = utf8CharacterLength(text);
  if (length == 1) {
    const char c = text.front();
    return static_cast<unsigned char>(c) >= 0x20 || c == '\t' || c == '\n' || c == '\r' ? 1 : 0;
  }
  const bool no_character = text.starts_with("\xEF\xBF\xBE") || text.starts_with("\xEF\xBF\xBF");
  return no_character ? 0 : length;
}

bool isUtf8(std::string_view text) {
  while (!text.empty()) {
    const std::size_t length = utf8CharacterLength(text);
    if (length == 0) return false;
    text.remove_prefix(length);
  }
  return true;
}

std::string xmlText(std::string_view text, std::string_view substitute) {
  std::string out;
  while (!text.empty()) {
    const std::size_t length = xmlCharacterLength(text);
    out += length == 0 ? substitute : text.substr(0, length);
    text.remove_prefix(std::max<std::size_t>(length, 1));
  }
  return out;
}

}  // namespace lmx
