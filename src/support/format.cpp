// printf formatting on top of vsnprintf.
#include "support/format.h"

#include <cstdarg>
#include <cstdio>

namespace lmx {

std::string string_with_format(const char* format, ...) {
  char small[256];
  va_list arguments;
  va_start(arguments, format);
  const int needed = std::vsnprintf(small, sizeof small, format, arguments);
  va_end(arguments);
  if (needed < 0) return {};
  const auto length = static_cast<std::size_t>(needed);
  if (length < sizeof small) return {small, length};
  std::string text(length, '\0');
  va_start(arguments, format);
  std::vsnprintf(text.data(), text.size() + 1, format, arguments);
  va_end(arguments);
  return text;
}

}  // namespace lmx
