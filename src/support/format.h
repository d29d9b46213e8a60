// printf formatting into a string.
#pragma once
#include <string>

namespace lmx {

/// @return the formatted text; empty when it can't be formatted
std::string string_with_format(const char* format, ...) __attribute__((format(printf, 1, 2)));

}  // namespace lmx
