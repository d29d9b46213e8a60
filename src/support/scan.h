// Numbers at the beginning of a text, read as scanf reads them: blanks before are skipped, what follows is
// left.
#pragma once
#include <optional>
#include <string_view>

namespace lmx {

/// A decimal integer with an optional sign; nothing when there is none or 32 bits can't hold it.
std::optional<int> scanInteger(std::string_view text);

/// A finite decimal number with an optional sign, fraction and exponent.
std::optional<double> scanReal(std::string_view text);

}  // namespace lmx
