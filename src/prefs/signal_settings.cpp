// Reads and checks the thresholds.
#include "prefs/signal_settings.h"

#include <charconv>
#include <cmath>

#include "platform/log.h"

namespace lmx {
namespace {

struct Range {
  double least, greatest;
};

std::optional<double> numberIn(const std::string& text, Range range) {
  double value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  const bool whole = error == std::errc() && end == text.data() + text.size();
  if (!whole || !std::isfinite(value) || value < range.least || value > range.greatest) return std::nullopt;
  return value;
}

}  // namespace

SignalThresholds signalThresholds(const std::function<std::optional<std::string>(const char* key)>& read) {
  const auto threshold = [&read](const char* key, double normal, Range range) -> std::optional<double> {
    const auto text = read(key);
    if (!text) return normal;
    if (*text == "off") return std::nullopt;
    if (const auto value = numberIn(*text, range)) return value;
    LMPLogMessage(nullptr, kLogWarning, "The preference \"%s\" can't be \"%s\"; %g is used", key,
                  text->c_str(), normal);
    return normal;
  };
  const auto level = [&threshold](const char* key, int normal) -> std::optional<int> {
    const auto value = threshold(key, normal, {0, 255});
    return value ? std::optional(static_cast<int>(*value)) : std::nullopt;
  };
  const SignalThresholds normal;
  return {.seconds = threshold("SignalWarningSeconds", normal.seconds, {0, 3600}).value_or(0),
          .silenceDecibels = threshold("SignalSilenceDecibels", *normal.silenceDecibels, {-200, -20}),
          .clippingDecibels = threshold("SignalClippingDecibels", *normal.clippingDecibels, {-20, 0}),
          .blackLevel = level("SignalBlackLevel", *normal.blackLevel),
          .frozenDifference = level("SignalFrozenDifference", *normal.frozenDifference)};
}

}  // namespace lmx
