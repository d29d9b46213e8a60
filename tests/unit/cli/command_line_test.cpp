// Command-line options: what they set, what they print, and the exit code.
#include "cli/command_line.h"

#include <ctime>

#include "cli/usage.h"
#include "support/date_text.h"
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

class CommandLineTest : public AgentTest {
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
    const bool goesOn =
        CommandLine(context_->options, *framework_, children_).parseArgs(argv.data(), count, &code);
    const std::string output = ::testing::internal::GetCapturedStdout();
    return {goesOn, code, ::testing::internal::GetCapturedStderr(), output};
  }
};

std::string storedText(const char* key) {
  const PlistResult read = readPropertyList(systemPath(kPreferencesFile));
  const auto* dictionary = read ? read->dictionary() : nullptr;
  return dictionary != nullptr && dictionary->contains(key) ? *dictionary->at(key).string() : "";
}

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

TEST_F(CommandLineTest, WithoutOptionsTheProgramContinues) {
  const Outcome outcome = parse({});
  EXPECT_TRUE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.errors, "");
  EXPECT_FALSE(context_->options.submit_disabled.get());
}

TEST_F(CommandLineTest, HelpPrintsTheUsage) {
  for (const char* option : {"-h", "-H"}) {
    const Outcome outcome = parse({option});
    EXPECT_FALSE(outcome.goes_on);
    EXPECT_EQ(outcome.exit_code, 0);
    EXPECT_EQ(outcome.errors, kUsage);
  }
}

TEST_F(CommandLineTest, VersionIsPrinted) {
  const Outcome outcome = parse({"-v"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.errors, "\nLumex lmxagentd (version 100)\n\n");
}

TEST_F(CommandLineTest, SubmissionCanBeDisabled) {
  EXPECT_TRUE(parse({"-s"}).goes_on);
  EXPECT_TRUE(context_->options.submit_disabled.get());
}

TEST_F(CommandLineTest, UnknownOptionIsAUsageError) {
  const Outcome outcome = parse({"-x"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 64);
  EXPECT_EQ(outcome.errors, std::string("/usr/sbin/lmxagentd: invalid option -- 'x'\n") + kUsage);
  EXPECT_EQ(parse({"--unknown"}).exit_code, 64);
}

TEST_F(CommandLineTest, OptionsWithoutTheirArgumentAreUsageErrors) {
  for (const char* option : {"-c", "-d", "-f", "-p", "-t", "-u", "-Z", "--file", "--password", "--timerstart",
                             "--timerdelay", "--timerrevoke", "--max_duration", "--unattended_minutes"}) {
    const Outcome outcome = parse({option});
    EXPECT_FALSE(outcome.goes_on) << option;
    EXPECT_EQ(outcome.exit_code, 64) << option;
    EXPECT_TRUE(outcome.errors.ends_with(kUsage)) << option;
  }
}

TEST_F(CommandLineTest, DurationNeedsAdHocMode) {
  const Outcome outcome = parse({"-d", "60"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 64);
  EXPECT_EQ(outcome.errors, "The -d option only applies to ad-hoc mode (requires a file path)\n");
}

TEST_F(CommandLineTest, AnOutputFileSelectsAdHocMode) {
  EXPECT_TRUE(parse({"-f", "out.mov", "-d", "60", "-s"}).goes_on);
  EXPECT_TRUE(context_->options.adhoc.get());
  EXPECT_EQ(context_->options.adhoc_request_type.get(), 0);
  EXPECT_EQ(context_->options.adhoc_output_file.get(), "out.mov");
  EXPECT_EQ(context_->options.duration.get(), 60);
  EXPECT_EQ(context_->options.unattended.get(), 60) << "the default";
}

TEST_F(CommandLineTest, SubmissionNeedsAUser) {
  const Outcome outcome = parse({"--file", "out.mov"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 64);
  EXPECT_EQ(outcome.errors, "A user name is required for ad-hoc file submission.\n");
  EXPECT_TRUE(parse({"-f", "out.mov", "-u", "jane", "--password", "secret"}).goes_on);
  EXPECT_EQ(context_->options.user.get(), "jane");
  EXPECT_EQ(context_->options.password.get(), "secret");
}

TEST_F(CommandLineTest, QueriesNeedNoUser) {
  EXPECT_TRUE(parse({"--status"}).goes_on);
  EXPECT_TRUE(context_->options.adhoc.get());
  EXPECT_EQ(context_->options.adhoc_request_type.get(), 1);
  EXPECT_TRUE(parse({"--timerlist"}).goes_on);
  EXPECT_EQ(context_->options.adhoc_request_type.get(), 2);
  EXPECT_TRUE(parse({"--timerrevoke", "T-1"}).goes_on);
  EXPECT_EQ(context_->options.adhoc_request_type.get(), 3);
  EXPECT_EQ(context_->options.timer_id.get(), "T-1");
}

TEST_F(CommandLineTest, ANonUtf8PathEndsTheParsing) {
  const Outcome outcome = parse({"-f", "H\xF6rsaal.mov", "-v"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 71);
  EXPECT_EQ(outcome.errors, "The -f option requires a path in UTF-8\n");
  EXPECT_FALSE(context_->options.adhoc.get());
}

TEST_F(CommandLineTest, AnInvalidNumberRepeatsTheLastOne) {
  EXPECT_TRUE(parse({"-f", "a.mov", "-s", "-d", "x"}).goes_on);
  EXPECT_EQ(context_->options.duration.get(), 0);
  EXPECT_TRUE(parse({"-Z", "30", "-d", "x", "-f", "a.mov", "-s"}).goes_on);
  EXPECT_EQ(context_->options.unattended.get(), 30);
  EXPECT_EQ(context_->options.duration.get(), 30);
  EXPECT_TRUE(parse({"--max_duration", "45", "--unattended_minutes", "", "-f", "a.mov", "-s"}).goes_on);
  EXPECT_EQ(context_->options.duration.get(), 45);
  EXPECT_EQ(context_->options.unattended.get(), 45);
}

TEST_F(CommandLineTest, TimerStartIsTakenAsGiven) {
  EXPECT_TRUE(parse({"--timerstart", "tomorrow"}).goes_on);
  EXPECT_EQ(context_->options.start_timer.get(), "tomorrow");
  EXPECT_FALSE(context_->options.adhoc.get());
}

TEST_F(CommandLineTest, TimerDelayBecomesADate) {
  const std::time_t before = std::time(nullptr);
  EXPECT_TRUE(parse({"--timerdelay", "90"}).goes_on);
  EXPECT_FALSE(context_->options.adhoc.get());
  const auto start = context_->options.start_timer.get();
  ASSERT_TRUE(start);
  bool found = false;
  for (std::time_t at = before + 90; at <= std::time(nullptr) + 91; ++at) found |= start == dateText(at);
  EXPECT_TRUE(found) << *start;
}

TEST_F(CommandLineTest, AnInvalidTimerDelayIsIgnored) {
  for (const char* delay : {"-5", "0", "abc", "", "nan", "1e300"}) {
    const Outcome outcome = parse({"--timerdelay", delay});
    EXPECT_TRUE(outcome.goes_on) << delay;
    EXPECT_EQ(outcome.errors, "") << delay;
    EXPECT_EQ(context_->options.start_timer.get(), std::nullopt) << delay;
  }
}

TEST_F(CommandLineTest, OptionsAfterAnEndingOneAreIgnored) {
  EXPECT_EQ(parse({"-v", "-d", "60"}).exit_code, 0);
  EXPECT_EQ(parse({"-d", "60", "-h"}).exit_code, 0);
  EXPECT_EQ(context_->options.duration.get(), 60);
  EXPECT_EQ(parse({"-x", "-v"}).exit_code, 64);
}

TEST_F(CommandLineTest, AnUnknownKindOfInformationPrintsNothing) {
  const Outcome outcome = parse({"-i", "nonsense"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.output + outcome.errors, "");
}

TEST_F(CommandLineTest, AdHocPreferencesAreDumped) {
  const Outcome outcome = parse({"-i", "ad-hoc-prefs"});
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_TRUE(outcome.errors.starts_with("Got recording context (with ad-hoc-prefs): "));
  EXPECT_TRUE(outcome.output.starts_with("\n\n'RecordingType' == "));
}

TEST_F(CommandLineTest, BindTakesPrecedenceOverThePreviewPath) {
  children_.result.output =
      "Successfully bound " + std::string(36, 'c') + std::string(11, ' ') + std::string(36, 's');
  const Outcome bound = parse({"-p", "/p.jpg", "-t", "/a.mov", "-u", "jane", "-c", "host"});
  EXPECT_FALSE(bound.goes_on);
  EXPECT_EQ(bound.exit_code, 0);
  EXPECT_EQ(storedText("PreviewPath"), "/p.jpg");
  EXPECT_EQ(storedText("RecordingPath"), "/a.mov");

  children_.result.status = 9;
  EXPECT_EQ(parse({"-t", "/b.mov", "-u", "jane", "-c", "host", "-p", "/q.jpg"}).exit_code, 9);
  EXPECT_EQ(storedText("PreviewPath"), "/p.jpg");
}

TEST_F(CommandLineTest, APreviewPathAloneIsSet) {
  const Outcome outcome = parse({"-p", "/p.jpg"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(storedText("PreviewPath"), "/p.jpg");
}

TEST_F(CommandLineTest, ABindTestNeedsItsUserAndServer) {
  const Outcome outcome = parse({"-t", "/a.mov"});
  EXPECT_EQ(outcome.exit_code, 64);
  EXPECT_NE(outcome.errors.find("Usage: lmxagentd -t <file-path> -u <username> -c <server>\n"),
            std::string::npos);
}

TEST_F(CommandLineTest, InformationWithoutItsKindIsAUsageError) { EXPECT_EQ(parse({"-i"}).exit_code, 64); }

TEST_F(CommandLineTest, DeviceListComesFromTheFramework) {
  const Outcome outcome = parse({"-i", "zq-device-list"});
  EXPECT_FALSE(outcome.goes_on);
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.output, "camera up to 1920 at 30, microphone\n");
}

TEST_F(CommandLineTest, DaemonPreferencesAreDumped) {
  const Outcome outcome = parse({"-i", "daemon-prefs"});
  EXPECT_EQ(outcome.exit_code, 0);
  EXPECT_EQ(outcome.errors.substr(0, 43), "Got recording context (with daemon-prefs): ");
  EXPECT_NE(outcome.output.find("'RecordingType' == 'Audio+Video'\n"), std::string::npos);
  EXPECT_NE(outcome.output.find("'RecordingAudioInput' == 'microphone'\n"), std::string::npos);
}

TEST_F(CommandLineTest, UnusablePreferencesAreASoftwareError) {
  framework_->microphone_well_formed = false;
  EXPECT_EQ(parse({"-i", "daemon-prefs"}).exit_code, 70);
  EXPECT_TRUE(log_.contains(
      2, "Exception caught: Unknown device ID: microphone for preference: RecordingAudioInput"));
}

TEST(ToolName, IsTheLastPartOfThePath) {
  EXPECT_EQ(toolNameFromPathArg("/usr/sbin/lmxagentd"), "lmxagentd");
  EXPECT_EQ(toolNameFromPathArg("lmxagentd"), "lmxagentd");
  EXPECT_EQ(toolNameFromPathArg(nullptr), "");
}

}  // namespace
}  // namespace lmx
