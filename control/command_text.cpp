// Small text rules of the command protocol: what is trimmed, what is counted, what is hidden from the log.
#include "control/command_text.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <limits>

namespace lmx {
namespace {

using namespace std::string_view_literals;

constexpr std::array kLineBreaks{"\n"sv, "\v"sv, "\f"sv, "\r"sv, "\u0085"sv, "\u2028"sv, "\u2029"sv};

constexpr bool isContinuation(unsigned char byte) { return (byte & 0xC0) == 0x80; }

/// Bytes of the UTF-8 sequence that begins with `lead`, with the narrowest second byte allowed; length 0: no
/// lead byte.
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

std::string_view trimLineBreaks(std::string_view text) {
  const auto cutFront = [&](std::string_view end) {
    const bool found = text.starts_with(end);
    if (found) text.remove_prefix(end.size());
    return found;
  };
  const auto cutBack = [&](std::string_view end) {
    const bool found = text.ends_with(end);
    if (found) text.remove_suffix(end.size());
    return found;
  };
  while (std::any_of(kLineBreaks.begin(), kLineBreaks.end(), cutFront)) {
  }
  while (std::any_of(kLineBreaks.begin(), kLineBreaks.end(), cutBack)) {
  }
  return text;
}

bool isUtf8(std::string_view text) {
  while (!text.empty()) {
    const auto at = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    const Sequence sequence = sequenceOf(at(0));
    if (sequence.length == 0 || sequence.length > text.size()) return false;
    if (sequence.length > 1 && (at(1) < sequence.second_from || at(1) > sequence.second_to)) return false;
    for (std::size_t i = 2; i < sequence.length; ++i) {
      if (!isContinuation(at(i))) return false;
    }
    text.remove_prefix(sequence.length);
  }
  return true;
}

std::size_t characterCount(std::string_view utf8) {
  return static_cast<std::size_t>(std::count_if(
      utf8.begin(), utf8.end(), [](char c) { return !isContinuation(static_cast<unsigned char>(c)); }));
}

std::int32_t decimalValue(const std::string& text) {
  using Limits = std::numeric_limits<std::int32_t>;
  const long long value = std::strtoll(text.c_str(), nullptr, 10);
  return static_cast<std::int32_t>(std::clamp<long long>(value, Limits::min(), Limits::max()));
}

std::string withoutSecrets(std::string_view command) {
  constexpr auto kKey = "RecordingMetadata_AGENT_PASSWORD="sv;
  std::string shown;
  for (auto found = command.find(kKey); found != std::string_view::npos; found = command.find(kKey)) {
    shown.append(command.substr(0, found + kKey.size())).append("****");
    command.remove_prefix(found + kKey.size());
    // A value ends at the next comma, whatever blanks or equals signs it holds.
    command.remove_prefix(std::min(command.find(','), command.size()));
  }
  return shown.append(command);
}

}  // namespace lmx
