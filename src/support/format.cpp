// printf formatting on top of vsnprintf.
#include "support/format.h"

#include <cstdarg>
#include <cstdio>

namespace lmx {
namespace {

/// Formats into `buffer` of `size` bytes. @return the length needed, without the NUL; negative on failure
__attribute__((format(printf, 3, 0))) int formatInto(char* buffer, std::size_t size, const char* format,
                                                     va_list arguments) {
  va_list copy;
  va_copy(copy, arguments);
  const int length = std::vsnprintf(buffer, size, format, copy);
  va_end(copy);
  return length;
}

}  // namespace

std::string string_with_format(const char* format, ...) {
  char small[256];
  va_list arguments;
  va_start(arguments, format);
  const int length = formatInto(small, sizeof small, format, arguments);
  std::string text;
  if (length >= 0 && static_cast<std::size_t>(length) < sizeof small) {
    text.assign(small, static_cast<std::size_t>(length));
  } else if (length >= 0) {
    text.resize(static_cast<std::size_t>(length));
    formatInto(text.data(), text.size() + 1, format, arguments);
  }
  va_end(arguments);
  return text;
}

}  // namespace lmx
