// Turns the text of one command into a verb and its parameters.
#include "control/protocol/command_parser.h"

#include <algorithm>

#include "control/protocol/command_text.h"

namespace lmx {
namespace {

using namespace std::string_view_literals;

Dictionary parseParameters(std::string_view text) {
  Dictionary parameters;
  for (std::size_t from = 0; from <= text.size();) {
    const std::size_t to = std::min(text.find(',', from), text.size());
    const std::string_view piece = text.substr(from, to - from);
    from = to + 1;

    const std::size_t equals = piece.find('=');
    const std::string_view key = piece.substr(0, equals);
    if (key == "digest"sv) {
      // The answer to a challenge holds commas and equals signs of its own, so it runs to the end of the
      // line.
      const std::size_t digest = text.find("digest="sv);
      if (digest != std::string_view::npos) {
        parameters.insert_or_assign("digest", std::string(text.substr(digest + "digest="sv.size())));
        return parameters;
      }
    }
    if (std::count(piece.begin(), piece.end(), '=') != 1) continue;
    parameters.insert_or_assign(std::string(key), std::string(trimLineBreaks(piece.substr(equals + 1))));
  }
  return parameters;
}

}  // namespace

Command parseCommand(std::string_view text) {
  const std::size_t blank = text.find(' ');
  Command command{std::string(text.substr(0, blank)), std::nullopt};
  if (blank != std::string_view::npos) command.parameters = parseParameters(text.substr(blank + 1));
  return command;
}

}  // namespace lmx
