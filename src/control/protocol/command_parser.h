// Turns the text of one command into a verb and its parameters.
#pragma once
#include <optional>
#include <string>
#include <string_view>

#include "support/dictionary.h"

namespace lmx {

struct Command {
  std::string verb;                      ///< case-sensitive; may be empty
  std::optional<Dictionary> parameters;  ///< absent when the text holds no blank; may be empty
  bool operator==(const Command&) const = default;
};

/// Splits "VERB key=value,key=value". Pieces without exactly one "=" are ignored; a later duplicate replaces
/// an earlier one; "digest" takes everything up to the end of the line. Pure.
Command parseCommand(std::string_view text);

/// Whether the parameter `key` is exactly "true".
inline bool isTrue(const Dictionary* parameters, std::string_view key) {
  return lookUp(parameters, key) == "true";
}

}  // namespace lmx
