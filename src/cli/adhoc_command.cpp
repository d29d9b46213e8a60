// Builds the ad-hoc client's commands.
#include "cli/adhoc_command.h"

#include "model/codes.h"

namespace lmx {
namespace {

/// The same for every ad-hoc start, because no server assigns an identifier.
constexpr const char* kRecordingUUID = "90201534-37B5-482F-AD57-C3762F5020E1";
constexpr const char* kWorkflowUUID = "DEFA1587-A650-426E-92DA-01C5EB811705";

std::string startParameters(const RunOptions& options) {
  std::string text = std::string("RecordingMetadata_RECORDING_UUID=") + kRecordingUUID;
  const auto add = [&text](const char* key, const std::string& value) {
    text.append(",").append(key).append("=").append(value);
  };
  const auto addIfSet = [&add](const char* key, const RunOptions::Text& value) {
    if (value) add(key, *value);
  };
  add("RecordingMetadata_MAX_RECORDING_MINUTES", std::to_string(options.duration.get()));
  add("RecordingMetadata_UNATTENDED_RECORDING_MINUTES", std::to_string(options.unattended.get()));
  add("RecordingMetadata_ADHOC_WORKFLOW_UUID", kWorkflowUUID);
  if (options.submit_disabled.get()) add("RecordingMetadata_ADHOC_SUBMIT_DISABLED", "1");
  addIfSet("RecordingMetadata_AGENT_USERNAME", options.user.get());
  addIfSet("RecordingMetadata_AGENT_PASSWORD", options.password.get());
  addIfSet("RecordingMetadata_ADHOC_FILE_PATH", options.adhoc_output_file.get());
  return text;
}

}  // namespace

std::string adHocCommand(const RunOptions& options) {
  switch (options.adhoc_request_type.get()) {
    case kAdHocStatus:
      return "STATUS include_preview=true\n";
    case kAdHocTimerList:
      return "TIMEDCMD command=TIMERLIST\n";
    case kAdHocTimerRevoke:
      return "TIMEDCMD command=TIMERREVOKE,TimerID=" + options.timer_id.get().value_or("") + "\n";
    default:
      break;
  }
  const auto time = options.start_timer.get();
  return (time ? "TIMEDCMD time=" + *time + ",command=START," : "START ") + startParameters(options) + "\n";
}

}  // namespace lmx
