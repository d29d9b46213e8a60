// What the parameters of a START say about the limits of the recording.
#include "control/handlers/recording_configuration.h"

#include <cmath>
#include <cstdlib>
#include <limits>
#include <memory>

#include "control/channel/agent_control_base.h"
#include "control/protocol/command_text.h"
#include "model/agent_context.h"
#include "record/agent_record.h"

namespace lmx {

std::int32_t hardStopSeconds(const std::string& minutes) {
  constexpr auto kMost = std::numeric_limits<std::int32_t>::max();
  const double seconds = std::round(std::strtod(minutes.c_str(), nullptr) * 60.0);
  if (!std::isfinite(seconds) || seconds <= 0) return 0;
  return seconds >= kMost ? kMost : static_cast<std::int32_t>(seconds);
}

int AgentControlBase::configure(const Dictionary* parameters) {
  if (parameters == nullptr) return 1;
  const auto own = std::make_shared<const Dictionary>(*parameters);
  properties.set(own);
  const auto context = agentContext();
  const auto session = context ? context->record_context() : nullptr;
  const auto given = [&](const char* key) { return lookUp(own, key).value_or(""); };

  if (const auto minutes = given("RecordingMetadata_MAX_RECORDING_MINUTES"); session && !minutes.empty()) {
    session->stop_times.setRecordHardStopTimeSeconds(hardStopSeconds(minutes));
  }
  if (const auto minutes = given("RecordingMetadata_UNATTENDED_RECORDING_MINUTES");
      session && !minutes.empty()) {
    session->stop_times.maxUnattendedRecordingMinutes.set(decimalValue(minutes));
  }
  if (const auto user = given("RecordingMetadata_AGENT_USERNAME"); context && !user.empty()) {
    context->options.user.set(user);
  }
  if (const auto password = given("RecordingMetadata_AGENT_PASSWORD"); context && !password.empty()) {
    context->options.password.set(password);
  }
  return 0;
}

}  // namespace lmx
