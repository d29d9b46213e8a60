// Small text rules of the command protocol: what is trimmed, what is hidden from the log.
#include "control/protocol/command_text.h"

#include <algorithm>
#include <array>

#include "model/metadata_keys.h"

namespace lmx {
namespace {

using namespace std::string_view_literals;

constexpr std::array kLineBreaks{"\n"sv, "\v"sv, "\f"sv, "\r"sv, "\u0085"sv, "\u2028"sv, "\u2029"sv};

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

std::string withoutSecrets(std::string_view command) {
  const std::string key = std::string(metadata_key::kAgentPassword) + "=";
  std::string shown;
  for (auto found = command.find(key); found != std::string_view::npos; found = command.find(key)) {
    shown.append(command.substr(0, found + key.size())).append("****");
    command.remove_prefix(found + key.size());
    // A value ends at the next comma, whatever blanks or equals signs it holds.
    command.remove_prefix(std::min(command.find(','), command.size()));
  }
  return shown.append(command);
}

}  // namespace lmx
