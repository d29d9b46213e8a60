// Parses a number at the beginning of a text, as scanf does: skips white space before it and ignores what
// follows.
#pragma once
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// A decimal integer with an optional sign; nothing when there is none or it doesn't fit into 32 bits.
std::optional<int> scanInteger(std::string_view text);

/// The decimal number at the start of `text`, 0 when there is none; what 32 bits can't hold becomes the
/// nearest limit.
std::int32_t decimalValue(const std::string& text);

/// A finite decimal number with an optional sign, fraction and exponent.
std::optional<double> scanReal(std::string_view text);

}  // namespace lmx
