// printf formatting into a string.
#pragma once
#include <optional>
#include <string>

namespace lmx {

/// @return the formatted text; empty when it can't be formatted
std::string string_with_format(const char* format, ...) __attribute__((format(printf, 1, 2)));

/// The text as messages print it: "(null)" when there is none.
std::string textOrNull(const std::optional<std::string>& text);

}  // namespace lmx
