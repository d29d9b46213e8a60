// printf formatting into memory of its own.
#pragma once
#include <string>

namespace lmx {

/// @return the formatted text in a new block that the caller frees; null on failure.
char* string_with_format(const char* format, ...) __attribute__((format(printf, 1, 2)));

/// The same as a string; empty on failure.
std::string formatted(const char* format, ...) __attribute__((format(printf, 1, 2)));

}  // namespace lmx
