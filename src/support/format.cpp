// printf formatting on top of vsnprintf.
#include "support/format.h"

#include <cstdarg>
#include <cstdio>

namespace lmx {
namespace {

/// @return the length that the text needs, without its NUL; negative when it can't be formatted
__attribute__((format(printf, 3, 0))) int formatInto(char* buffer, std::size_t size, const char* format,
                                                     va_list arguments) {
  // The analyzer loses sight of the list at the call.
  return std::vsnprintf(buffer, size, format, arguments);  // NOLINT(clang-analyzer-valist.Uninitialized)
}

}  // namespace

std::string string_with_format(const char* format, ...) {
  char small[256];
  va_list arguments;
  va_start(arguments, format);
  const int needed = formatInto(small, sizeof small, format, arguments);
  va_end(arguments);
  if (needed < 0) return {};
  const auto length = static_cast<std::size_t>(needed);
  if (length < sizeof small) return {small, length};
  std::string text(length, '\0');
  va_start(arguments, format);
  formatInto(text.data(), text.size() + 1, format, arguments);
  va_end(arguments);
  return text;
}

std::string textOrNull(const std::optional<std::string>& text) { return text.value_or("(null)"); }

}  // namespace lmx
