// printf into memory.
#include "support/format.h"

#include <cstdarg>
#include <cstdio>
#include <cstdlib>

namespace lmx {

char* string_with_format(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  char* text = nullptr;
  const int length = vasprintf(&text, format, arguments);
  va_end(arguments);
  return length < 0 ? nullptr : text;
}

std::string formatted(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  char* text = nullptr;
  const int length = vasprintf(&text, format, arguments);
  va_end(arguments);
  if (length < 0) return {};
  std::string result(text, static_cast<std::size_t>(length));
  std::free(text);
  return result;
}

}  // namespace lmx
