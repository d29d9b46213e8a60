// Parses a number at the beginning of a text, as scanf does: skips white space before it and ignores what
// follows.
#pragma once
#include <optional>
#include <string_view>

namespace lmx {

/// A decimal integer with an optional sign; nothing when there is none or it doesn't fit into 32 bits.
std::optional<int> scanInteger(std::string_view text);

/// A finite decimal number with an optional sign, fraction and exponent.
std::optional<double> scanReal(std::string_view text);

}  // namespace lmx
