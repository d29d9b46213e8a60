// The ad-hoc client's commands, byte for byte.
#include "cli/adhoc_command.h"

#include <gtest/gtest.h>

#include <functional>

#include "model/codes.h"

namespace lmx {
namespace {

constexpr const char* kFixed = "RecordingMetadata_RECORDING_UUID=90201534-37B5-482F-AD57-C3762F5020E1,";
constexpr const char* kWorkflow =
    ",RecordingMetadata_ADHOC_WORKFLOW_UUID=DEFA1587-A650-426E-92DA-01C5EB811705";

std::string minutes(int most, int unattended) {
  return "RecordingMetadata_MAX_RECORDING_MINUTES=" + std::to_string(most) +
         ",RecordingMetadata_UNATTENDED_RECORDING_MINUTES=" + std::to_string(unattended);
}

struct CommandCase {
  const char* name;
  std::function<void(RunOptions&)> options;
  std::string command;
};
class AdHocCommand : public ::testing::TestWithParam<CommandCase> {};

TEST_P(AdHocCommand, IsBuiltFromTheOptions) {
  RunOptions options;
  GetParam().options(options);
  EXPECT_EQ(adHocCommand(options), GetParam().command);
}

INSTANTIATE_TEST_SUITE_P(
    All, AdHocCommand,
    ::testing::Values(
        CommandCase{"Start", [](RunOptions&) {},
                    std::string("START ") + kFixed + minutes(240, 60) + kWorkflow + "\n"},
        CommandCase{"StartWithEverything",
                    [](RunOptions& c) {
                      c.duration.set(5);
                      c.unattended.set(-1);
                      c.submit_disabled.set(true);
                      c.user.set("jane doe");
                      c.password.set("a,b=c");
                      c.adhoc_output_file.set("/tmp/Hörsaal 3.mov");
                    },
                    std::string("START ") + kFixed + minutes(5, -1) + kWorkflow +
                        ",RecordingMetadata_ADHOC_SUBMIT_DISABLED=1,RecordingMetadata_AGENT_USERNAME=jane doe"
                        ",RecordingMetadata_AGENT_PASSWORD=a,b=c"
                        ",RecordingMetadata_ADHOC_FILE_PATH=/tmp/Hörsaal 3.mov\n"},
        CommandCase{"StartWithAUserOnly", [](RunOptions& c) { c.user.set("jane"); },
                    std::string("START ") + kFixed + minutes(240, 60) + kWorkflow +
                        ",RecordingMetadata_AGENT_USERNAME=jane\n"},
        CommandCase{"StartAtATime",
                    [](RunOptions& c) {
                      c.start_timer.set("2009-06-30 14:05:00 +0200");
                      c.adhoc_output_file.set("/tmp/a.mov");
                    },
                    std::string("TIMEDCMD time=2009-06-30 14:05:00 +0200,command=START,") + kFixed +
                        minutes(240, 60) + kWorkflow + ",RecordingMetadata_ADHOC_FILE_PATH=/tmp/a.mov\n"},
        CommandCase{"AnUnknownRequestIsAStart", [](RunOptions& c) { c.adhoc_request_type.set(9); },
                    std::string("START ") + kFixed + minutes(240, 60) + kWorkflow + "\n"},
        CommandCase{"Status", [](RunOptions& c) { c.adhoc_request_type.set(kAdHocStatus); },
                    "STATUS include_preview=true\n"},
        CommandCase{"TimerList", [](RunOptions& c) { c.adhoc_request_type.set(kAdHocTimerList); },
                    "TIMEDCMD command=TIMERLIST\n"},
        CommandCase{"TimerRevoke",
                    [](RunOptions& c) {
                      c.adhoc_request_type.set(kAdHocTimerRevoke);
                      c.timer_id.set("T-1");
                    },
                    "TIMEDCMD command=TIMERREVOKE,TimerID=T-1\n"}),
    [](const auto& test) { return std::string(test.param.name); });

}  // namespace
}  // namespace lmx
