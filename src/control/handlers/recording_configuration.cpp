// What the parameters of a START say about the recording: its limits, and who submits it.
#include "control/handlers/recording_configuration.h"

#include <cmath>
#include <cstdlib>
#include <limits>

#include "control/protocol/command_text.h"
#include "model/metadata_keys.h"

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

void configureStopTimes(const Dictionary& parameters, StopTimes& stop_times) {
  if (const auto minutes = given(parameters, metadata_key::kMaxRecordingMinutes); !minutes.empty())
    stop_times.setRecordHardStopTimeSeconds(hardStopSeconds(minutes));
  if (const auto minutes = given(parameters, metadata_key::kUnattendedMinutes); !minutes.empty())
    stop_times.maxUnattendedRecordingMinutes.set(decimalValue(minutes));
}

void configureSubmission(const Dictionary& parameters, RunOptions& options) {
  if (const auto user = given(parameters, metadata_key::kAgentUsername); !user.empty())
    options.user.set(user);
  if (const auto password = given(parameters, metadata_key::kAgentPassword); !password.empty())
    options.password.set(password);
}

}  // namespace lmx
