// Parses numbers independently of the locale.
#include "support/scan.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <limits>

namespace lmx {
namespace {

/// `text` from the first character of the number. from_chars accepts a minus sign, but neither leading white
/// space nor a plus.
std::string_view numberPart(std::string_view text) {
  text.remove_prefix(std::min(text.find_first_not_of(" \t\n\v\f\r"), text.size()));
  if (text.starts_with('+') && !text.substr(1).starts_with('-')) text.remove_prefix(1);
  return text;
}

template <typename Number>
std::optional<Number> scan(std::string_view text) {
  const std::string_view part = numberPart(text);
  Number value{};
  const auto read = std::from_chars(part.data(), part.data() + part.size(), value);
  if (read.ec != std::errc()) return std::nullopt;
  return value;
}

}  // namespace

std::int32_t decimalValue(const std::string& text) {
  using Limits = std::numeric_limits<std::int32_t>;
  const long long value = std::strtoll(text.c_str(), nullptr, 10);
  return static_cast<std::int32_t>(std::clamp<long long>(value, Limits::min(), Limits::max()));
}

std::optional<int> scanInteger(std::string_view text) { return scan<int>(text); }

std::optional<double> scanReal(std::string_view text) {
  const auto value = scan<double>(text);
  return value && std::isfinite(*value) ? value : std::nullopt;
}

}  // namespace lmx
