// The ad-hoc client's commands, byte for byte.
#include "cli/adhoc_command.h"
#include "record/agent_record.h"

#include <gtest/gtest.h>

#include <functional>

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
  std::function<void(AgentContext&)> options;
  std::string command;
};
class AdHocCommand : public ::testing::TestWithParam<CommandCase> {};

TEST_P(AdHocCommand, IsBuiltFromTheOptions) {
  const auto context = newAgentContext();
  GetParam().options(*context);
  EXPECT_EQ(adHocCommand(*context), GetParam().command);
}

INSTANTIATE_TEST_SUITE_P(
    All, AdHocCommand,
    ::testing::Values(
        CommandCase{"Start", [](AgentContext&) {},
                    std::string("START ") + kFixed + minutes(240, 60) + kWorkflow + "\n"},
        CommandCase{"StartWithEverything",
                    [](AgentContext& c) {
                      c.setDuration(5);
                      c.setUnattended(-1);
                      c.setSubmit_disabled(true);
                      c.setUser("jane doe");
                      c.setPassword("a,b=c");
                      c.setAdhoc_output_file("/tmp/Hörsaal 3.mov");
                    },
                    std::string("START ") + kFixed + minutes(5, -1) + kWorkflow +
                        ",RecordingMetadata_ADHOC_SUBMIT_DISABLED=1,RecordingMetadata_AGENT_USERNAME=jane doe"
                        ",RecordingMetadata_AGENT_PASSWORD=a,b=c"
                        ",RecordingMetadata_ADHOC_FILE_PATH=/tmp/Hörsaal 3.mov\n"},
        CommandCase{"StartWithAUserOnly", [](AgentContext& c) { c.setUser("jane"); },
                    std::string("START ") + kFixed + minutes(240, 60) + kWorkflow +
                        ",RecordingMetadata_AGENT_USERNAME=jane\n"},
        CommandCase{"StartAtATime",
                    [](AgentContext& c) {
                      c.setStart_timer("2009-06-30 14:05:00 +0200");
                      c.setAdhoc_output_file("/tmp/a.mov");
                    },
                    std::string("TIMEDCMD time=2009-06-30 14:05:00 +0200,command=START,") + kFixed +
                        minutes(240, 60) + kWorkflow + ",RecordingMetadata_ADHOC_FILE_PATH=/tmp/a.mov\n"},
        CommandCase{"AnUnknownRequestIsAStart", [](AgentContext& c) { c.setAdhoc_request_type(9); },
                    std::string("START ") + kFixed + minutes(240, 60) + kWorkflow + "\n"},
        CommandCase{"Status", [](AgentContext& c) { c.setAdhoc_request_type(kAdHocStatus); },
                    "STATUS include_preview=true\n"},
        CommandCase{"TimerList", [](AgentContext& c) { c.setAdhoc_request_type(kAdHocTimerList); },
                    "TIMEDCMD command=TIMERLIST\n"},
        CommandCase{"TimerRevoke",
                    [](AgentContext& c) {
                      c.setAdhoc_request_type(kAdHocTimerRevoke);
                      c.setTimer_id("T-1");
                    },
                    "TIMEDCMD command=TIMERREVOKE,TimerID=T-1\n"}),
    [](const auto& test) { return std::string(test.param.name); });

}  // namespace
}  // namespace lmx
