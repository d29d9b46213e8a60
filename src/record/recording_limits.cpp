// Reads the limits of a recording from the parameters of its START.
#include "record/recording_limits.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <limits>

#include "model/metadata_keys.h"
#include "support/scan.h"

namespace lmx {
namespace {

std::string given(const Dictionary& parameters, const char* key) {
  return lookUp(&parameters, key).value_or("");
}

}  // namespace

std::int32_t hardStopSeconds(const std::string& minutes) {
  constexpr auto kMost = std::numeric_limits<std::int32_t>::max();
  const double seconds = std::round(std::strtod(minutes.c_str(), nullptr) * 60.0);
  if (!std::isfinite(seconds) || seconds <= 0) return 0;
  return seconds >= kMost ? kMost : static_cast<std::int32_t>(seconds);
}

std::uint32_t greatestLengthInMinutes(std::int32_t usual, const std::string& askedMinutes) {
  if (usual < 1) return 0;
  constexpr std::uint32_t kMinute = 60;
  const auto seconds = static_cast<std::uint32_t>(hardStopSeconds(askedMinutes));
  return std::max(static_cast<std::uint32_t>(usual), (seconds + kMinute - 1) / kMinute);
}

void configureUnattendedLimit(const Dictionary& parameters, StopTimes& stop_times) {
  if (const auto minutes = given(parameters, metadata_key::kUnattendedMinutes); !minutes.empty())
    stop_times.maxUnattendedRecordingMinutes.set(decimalValue(minutes));
}

void configureStopTimes(const Dictionary& parameters, StopTimes& stop_times) {
  if (const auto minutes = given(parameters, metadata_key::kMaxRecordingMinutes); !minutes.empty())
    stop_times.setRecordHardStopTimeSeconds(hardStopSeconds(minutes));
  configureUnattendedLimit(parameters, stop_times);
}

}  // namespace lmx
