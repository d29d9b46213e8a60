// printf formatting on top of vasprintf.
#include "support/format.h"

#include <cstdarg>
#include <cstdio>

#include "support/heap_ptr.h"

namespace lmx {
namespace {

__attribute__((format(printf, 1, 0))) heap_ptr<char> format(const char* pattern, va_list arguments) {
  char* text = nullptr;
  // On failure the content of `text` is undefined, so it is taken over only on success.
  if (pattern == nullptr || vasprintf(&text, pattern, arguments) < 0) return nullptr;
  return heap_ptr<char>(text);
}

}  // namespace

char* string_with_format(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  heap_ptr<char> text = lmx::format(format, arguments);
  va_end(arguments);
  return text.release();
}

std::string formatted(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  const heap_ptr<char> text = lmx::format(format, arguments);
  va_end(arguments);
  return text ? std::string(text.get()) : std::string();
}

}  // namespace lmx
