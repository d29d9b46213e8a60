// Builds the ad-hoc client's commands.
#include "cli/adhoc_command.h"

#include "model/codes.h"
#include "model/metadata_keys.h"

namespace lmx {
namespace {

/// The same for every ad-hoc start, because no server assigns an identifier.
constexpr const char* kRecordingUUID = "90201534-37B5-482F-AD57-C3762F5020E1";
constexpr const char* kWorkflowUUID = "DEFA1587-A650-426E-92DA-01C5EB811705";

std::string startParameters(const RunOptions& options) {
  std::string text = std::string(metadata_key::kRecordingUUID) + "=" + kRecordingUUID;
  const auto add = [&text](const char* key, const std::string& value) {
    text.append(",").append(key).append("=").append(value);
  };
  const auto addIfSet = [&add](const char* key, const RunOptions::Text& value) {
    if (value) add(key, *value);
  };
  add(metadata_key::kMaxRecordingMinutes, std::to_string(options.duration.get()));
  add(metadata_key::kUnattendedMinutes, std::to_string(options.unattended.get()));
  add(metadata_key::kAdHocWorkflowUUID, kWorkflowUUID);
  if (options.submit_disabled.get()) add(metadata_key::kAdHocSubmitDisabled, "1");
  addIfSet(metadata_key::kAgentUsername, options.user.get());
  addIfSet(metadata_key::kAgentPassword, options.password.get());
  addIfSet(metadata_key::kAdHocFilePath, options.adhoc_output_file.get());
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
