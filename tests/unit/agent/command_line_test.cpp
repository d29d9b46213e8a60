// The options: what they set, what they print, with which exit code the program is to end.
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

class CommandLine : public AgentTest {
 protected:
  struct Outcome {
    bool goes_on;
    int exit_code;
    std::string errors;  ///< standard error
    std::string output;  ///< standard output
  };
  Outcome parse(std::vector<std::string> words) {
    words.insert(words.begin(), "/usr/sbin/lmxagentd");
    std::vector<char*> argv;
    for (std::string& word : words) argv.push_back(word.data());
    const int count = static_cast<int>(argv.size());
    argv.push_back(nullptr);
    int code = -1;
    ::testing::internal::CaptureStderr();
    ::testing::internal::CaptureStdout();
    const bool goesOn = agent_.parseArgs(argv.data(), count, &code);
    const std::string output = ::testing::internal::GetCapturedStdout();
    return {goesOn, code, ::testing::internal::GetCapturedStderr(), output};
  }
};

constexpr const char* kUsage =
    "\nlmxagentd (version 100)\n\n"
    "usage: lmxagentd [-dhsv] [-i [ad-hoc-prefs | daemon-prefs | zq-device-list]] [-f file_output_path]\n\n"
    "\t    -h (help usage)\n"
    "\t    -v (print version and application validity)\n"
    "\t    -d (duration in seconds of an ad-hoc recording)\n"
    "\t    -i (print the requested type of information)\n"
    "\t    -s (disables submission post-process step, enabled by default)\n"
    "\t    -f file_output_path (runs an ad-hoc capture on this machine)\n"
    "\nexample: lmxagentd -s\n\n";

TEST_F(CommandLine, WithoutOptionsTheProgramGoesOn) {
  const Outcome outcome = parse({});
  EXPECT_TRUE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.errors, "");
  EXPECT_FALSE(context_->submit_disabled());
}

TEST_F(CommandLine, HelpPrintsTheUsage) {
  for (const char* option : {"-h", "-H"}) {
    const Outcome outcome = parse({option});
    EXPECT_FALSE(outcome.goes_on);
    EXPECT_EQ(outcome.exit_code, 0);
    EXPECT_EQ(outcome.errors, kUsage);
  }
}

TEST_F(CommandLine, VersionIsPrinted) {
  const Outcome outcome = parse({"-v"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.errors, "\nLumex lmxagentd (version 100)\n\n");
}

TEST_F(CommandLine, SubmissionCanBeDisabled) {
  EXPECT_TRUE(parse({"-s"}).goes_on);
  EXPECT_TRUE(context_->submit_disabled());
}

TEST_F(CommandLine, UnknownOptionIsAUsageError) {
  const Outcome outcome = parse({"-Z"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 64);
  EXPECT_EQ(outcome.errors, std::string("/usr/sbin/lmxagentd: invalid option -- 'Z'\n") + kUsage);
}

TEST_F(CommandLine, InformationWithoutItsKindIsAUsageError) { EXPECT_EQ(parse({"-i"}).exit_code, 64); }

TEST_F(CommandLine, DeviceListComesFromTheFramework) {
  const Outcome outcome = parse({"-i", "zq-device-list"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.output, "camera, microphone\n");
}

TEST_F(CommandLine, DaemonPreferencesAreDumped) {
  const Outcome outcome = parse({"-i", "daemon-prefs"});
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.errors.substr(0, 43), "Got recording context (with daemon-prefs): ");
  EXPECT_NE(outcome.output.find("'RecordingType' == 'Audio+Video'\n"), std::string::npos);
  EXPECT_NE(outcome.output.find("'RecordingAudioInput' == 'microphone'\n"), std::string::npos);
}

TEST_F(CommandLine, PreferencesThatCannotBeUsedAreASoftwareError) {
  framework_->audio_device_usable = false;
  EXPECT_EQ(parse({"-i", "daemon-prefs"}).exit_code, 70);
  EXPECT_TRUE(log_.contains(
      2, "Exception caught: Unknown device ID: microphone for preference: RecordingAudioInput"));
}

TEST(ToolName, IsTheLastPartOfThePath) {
  EXPECT_EQ(AgentMain::toolNameFromPathArg("/usr/sbin/lmxagentd"), "lmxagentd");
  EXPECT_EQ(AgentMain::toolNameFromPathArg("lmxagentd"), "lmxagentd");
  EXPECT_EQ(AgentMain::toolNameFromPathArg(nullptr), "");
}

}  // namespace
}  // namespace lmx
