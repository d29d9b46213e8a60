// Submission of a job, with a scripted tool and with a real one.
#include "postprocess/submission.h"

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "tests/unit/postprocess/submit_fixture.h"

namespace lmx {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Entry = testing::LogCapture::Entry;
using End = ChildResult::End;
using Words = std::vector<std::string>;

const Entry kStarting{kLogInfo, "Post-process mechanism is starting..."};
const Entry kInProgress{kLogInfo, "Completion in progress..."};
const Entry kSubmitted{kLogInfo, "Recording completed with success"};
const Entry kDone{kLogInfo, "Post-process mechanism completed with success"};
const Entry kUnable{kLogCritical, "Error: unable to submit job"};
const Entry kIncomplete{kLogError, "An error occurred completing recording \"https://lumex.example\""};
const Entry kInternal{kLogCritical, "An internal error occurred during agent post-processing"};
const Entry kCommandLine{kLogDebug,
                         "/usr/bin/lumex --server https://lumex.example --submit --recording ABC --delete "};

TEST(SubmissionArguments, OfARecordingAreSix) {
  EXPECT_EQ(submissionArguments({.server = "https://s", .recordingUUID = "ABC"}),
            (Words{"--server", "https://s", "--submit", "--recording", "ABC", "--delete"}));
}

TEST(SubmissionArguments, OfAWorkflowNameFileUserAndPassword) {
  EXPECT_EQ(submissionArguments({.server = "https://s",
                                 .recordingUUID = "ABC",
                                 .workflow = "W-1",
                                 .file = "/my movie.mov",
                                 .user = "ada",
                                 .password = "secret word"}),
            (Words{"--server", "https://s", "--submit", "--file", "/my movie.mov", "--workflow_uuid", "W-1",
                   "--user", "ada", "-p", "secret word", "--delete"}));
}

TEST(SubmissionArguments, AnEmptyWorkflowIsAWorkflow) {
  EXPECT_EQ(submissionArguments({.server = "s", .recordingUUID = "ABC", .workflow = ""}),
            (Words{"--server", "s", "--submit", "--file", "", "--workflow_uuid", "", "--user", "", "-p", "",
                   "--delete"}));
}

class SubmissionJob : public testing::SubmitFixture {
 protected:
  SubmissionJob() {
    job_.agentContext = context_;
    job_.properties = {{"RecordingMetadata_RECORDING_UUID", "ABC"}};
    job_.recording_file_path = inRepository("ABC.mov");
    job_.properties_file_path = inRepository("ABC.xml");
    write(inRepository("ABC.mov"), "movie");
    write(inRepository("ABC.xml"), "document");
  }
  void expectFilesKept() const {
    EXPECT_EQ(contentOf(inRepository("ABC.mov")), "movie");
    EXPECT_EQ(contentOf(inRepository("ABC.xml")), "document");
  }
  static Entry exitCode(int code) {
    return {kLogCritical, "Error: unable to submit job, /usr/bin/lumex exit code: " + std::to_string(code)};
  }

  AgentSubmit job_;
};

TEST_F(SubmissionJob, RunsTheToolAndKeepsTheFilesForIt) {
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), 0);
  EXPECT_THAT(children_.runs(),
              ElementsAre(Words{systemPath("/usr/bin/lumex"), "--server", "https://lumex.example", "--submit",
                                "--recording", "ABC", "--delete"}));
  EXPECT_THAT(log_.entries(), ElementsAre(kStarting, kInProgress, kCommandLine, kSubmitted, kDone));
  expectFilesKept();
}

TEST_F(SubmissionJob, WaitsForTheToolAsLongAsItTakesWithItsStreamsInherited) {
  job_.addRecording(children_);
  EXPECT_EQ(children_.options().limit, std::nullopt);
  EXPECT_FALSE(children_.options().captureOutput);
  EXPECT_EQ(children_.options().reportEvery, std::chrono::minutes(10));
}

TEST_F(SubmissionJob, ALongSubmissionIsAWarningEachTenMinutes) {
  children_.on_run = [](const ChildOptions& options) {
    options.stillRunning(std::chrono::minutes(10));
    options.stillRunning(std::chrono::minutes(20) + std::chrono::seconds(3));
  };
  job_.addRecording(children_);
  EXPECT_THAT(
      log_.entries(),
      ElementsAre(kCommandLine, Entry{kLogWarning, "Still waiting for /usr/bin/lumex after 10 minutes"},
                  Entry{kLogWarning, "Still waiting for /usr/bin/lumex after 20 minutes"}));
}

TEST_F(SubmissionJob, ANonZeroExitIsLoggedWithItsCodeAndKeepsTheFiles) {
  children_.results = {{End::exited, 3, {}}};
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), -1);
  EXPECT_THAT(log_.entries(),
              ElementsAre(kStarting, kInProgress, kCommandLine, exitCode(3), kIncomplete, kInternal));
  expectFilesKept();
}

TEST_F(SubmissionJob, AToolKilledByASignalHasAShellsExitCode) {
  children_.results = {{End::signalled, 9, {}}};
  EXPECT_EQ(job_.addRecording(children_), 1);
  EXPECT_THAT(log_.entries(), ElementsAre(kCommandLine, exitCode(137)));
}

TEST_F(SubmissionJob, AToolThatCannotBeStartedIsLoggedWithItsPathAndReason) {
  children_.results = {{End::notStarted, EACCES, {}}};
  EXPECT_EQ(job_.addRecording(children_), 1);
  EXPECT_THAT(log_.entries(), ElementsAre(kCommandLine,
                                          Entry{kLogError, systemPath("/usr/bin/lumex") +
                                                               " could not be started: Permission denied"},
                                          kUnable));
  expectFilesKept();
}

TEST_F(SubmissionJob, WithoutARecordingIdentifierTheToolNeverRuns) {
  job_.properties = {{"RecordingMetadata_TITLE", "Optics"}};
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), -1);
  EXPECT_THAT(children_.runs(), IsEmpty());
  EXPECT_THAT(log_.entries(), ElementsAre(kStarting, kInProgress, kUnable, kIncomplete, kInternal));
}

TEST_F(SubmissionJob, WithoutAContextTheToolNeverRuns) {
  job_.agentContext = nullptr;
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), -1);
  EXPECT_THAT(children_.runs(), IsEmpty());
  EXPECT_TRUE(log_.contains(kUnable.level, kUnable.text));
}

TEST_F(SubmissionJob, AWorkflowIsSubmittedWithUserAndPassword) {
  job_.adhoc_workflow_uuid = "W-1";
  context_->options.user.set("ada");
  context_->options.password.set("secret");
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), 0);
  EXPECT_THAT(children_.runs(),
              ElementsAre(Words{systemPath("/usr/bin/lumex"), "--server", "https://lumex.example", "--submit",
                                "--file", inRepository("ABC.mov"), "--workflow_uuid", "W-1", "--user", "ada",
                                "-p", "secret", "--delete"}));
  EXPECT_TRUE(log_.contains(kLogDebug, "/usr/bin/lumex --server https://lumex.example --submit --file " +
                                           inRepository("ABC.mov") +
                                           " --workflow_uuid W-1 --user ada -p secret --delete "));
}

TEST_F(SubmissionJob, ThePasswordAppearsOnlyInTheCommandLine) {
  job_.adhoc_workflow_uuid = "W-1";
  context_->options.user.set("ada");
  context_->options.password.set("secret");
  children_.results = {{End::notStarted, ENOENT, {}}};
  job_.addRecordingWithCommentary(children_);
  for (const Entry& entry : log_.entries()) {
    if (entry.level == kLogDebug) continue;
    EXPECT_EQ(entry.text.find("secret"), std::string::npos) << entry.text;
  }
}

TEST_F(SubmissionJob, AWorkflowWithoutPasswordFailsBeforeTheTool) {
  job_.adhoc_workflow_uuid = "W-1";
  context_->options.user.set("ada");
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), -1);
  EXPECT_THAT(children_.runs(), IsEmpty());
  EXPECT_THAT(log_.entries(), ElementsAre(kStarting, kInProgress, kUnable, kIncomplete, kInternal));
}

TEST_F(SubmissionJob, AWorkflowWithoutUserFailsBeforeTheTool) {
  job_.adhoc_workflow_uuid = "";
  context_->options.password.set("secret");
  EXPECT_EQ(job_.addRecording(children_), 1);
  EXPECT_THAT(children_.runs(), IsEmpty());
  EXPECT_THAT(log_.entries(), ElementsAre(kUnable));
}

TEST_F(SubmissionJob, DisabledSubmissionDoesNothing) {
  context_->options.submit_disabled.set(true);
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), 0);
  EXPECT_THAT(children_.runs(), IsEmpty());
  EXPECT_THAT(log_.entries(), ElementsAre(kStarting, kDone));
  expectFilesKept();
}

// Canceled recordings.

class CanceledJob : public SubmissionJob, public ::testing::WithParamInterface<bool> {};

TEST_P(CanceledJob, RemovesBothFilesWhetherSubmissionIsDisabledOrNot) {
  context_->options.submit_disabled.set(GetParam());
  job_.canceled = true;
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), 0);
  EXPECT_THAT(children_.runs(), IsEmpty());
  EXPECT_EQ(filesInRepository(), 0U);
  EXPECT_THAT(
      log_.entries(),
      ElementsAre(kStarting, Entry{kLogInfo, "Submission not launched because the recording was canceled"},
                  Entry{kLogInfo, "File \"" + inRepository("ABC.mov") + "\" was removed"},
                  Entry{kLogInfo, "File \"" + inRepository("ABC.xml") + "\" was removed"}, kDone));
}
INSTANTIATE_TEST_SUITE_P(Submission, CanceledJob, ::testing::Bool(),
                         [](const auto& instance) { return instance.param ? "Disabled" : "Enabled"; });

TEST_F(SubmissionJob, ACanceledJobWhoseMovieIsGoneStillRemovesTheDocument) {
  std::filesystem::remove(inRepository("ABC.mov"));
  job_.canceled = true;
  EXPECT_EQ(job_.addRecordingWithCommentary(children_), 0);
  EXPECT_TRUE(
      log_.contains(kLogError, "An error occurred removing file \"" + inRepository("ABC.mov") + "\""));
  EXPECT_TRUE(log_.contains(kLogInfo, "File \"" + inRepository("ABC.xml") + "\" was removed"));
  EXPECT_EQ(filesInRepository(), 0U);
}

// "File" recordings.

class FileRecording : public SubmissionJob {
 protected:
  FileRecording() {
    std::filesystem::create_directories(elsewhere());
    write(elsewhere() + "/talk.mov", movie_);
    write(elsewhere() + "/talk.xml", "talk's document");
    job_.recording_file_path = elsewhere() + "/talk.mov";
    job_.properties_file_path = elsewhere() + "/talk.xml";
    job_.properties = {{"RecordingMetadata_RECORDING_UUID", "NEW"}};
    context_->record_context()->recordingType.set(kRecordingTypeFile);
  }
  static std::string elsewhere() { return kRoot_ + "/elsewhere"; }

  static inline const std::string kRoot_ = testing::kTestRoot.path();
  const std::string movie_ = std::string(200000, 'm') + "end";  // more than one copy buffer
};

TEST_F(FileRecording, IsCopiedIntoTheRepositoryBeforeTheToolRuns) {
  std::optional<std::string> seen;
  children_.on_run = [&seen](const ChildOptions&) { seen = contentOf(inRepository("NEW.mov")); };
  EXPECT_EQ(job_.addRecording(children_), 0);
  EXPECT_EQ(seen, movie_);
  EXPECT_EQ(contentOf(inRepository("NEW.xml")), "talk's document");
  EXPECT_EQ(modeOf(inRepository("NEW.mov")), std::filesystem::perms{0644});
  EXPECT_EQ(modeOf(inRepository("NEW.xml")), std::filesystem::perms{0600}) << "it may hold a password";
  EXPECT_EQ(contentOf(elsewhere() + "/talk.mov"), movie_);
  EXPECT_EQ(filesInRepository(), 4U);  // no temporary file left
}

TEST_F(FileRecording, TheCopiesStayWhenTheToolFails) {
  children_.results = {{End::exited, 1, {}}};
  EXPECT_EQ(job_.addRecording(children_), 1);
  EXPECT_EQ(contentOf(inRepository("NEW.mov")), movie_);
  EXPECT_EQ(contentOf(inRepository("NEW.xml")), "talk's document");
}

TEST_F(FileRecording, AnExistingCopyIsKeptAndTheSubmissionGoesOn) {
  write(inRepository("NEW.mov"), "older");
  EXPECT_EQ(job_.addRecording(children_), 0);
  EXPECT_EQ(contentOf(inRepository("NEW.mov")), "older");
  EXPECT_EQ(contentOf(inRepository("NEW.xml")), "talk's document");
  EXPECT_TRUE(log_.contains(kLogDebug, "\"" + elsewhere() + "/talk.mov\" was not copied to \"" +
                                           inRepository("NEW.mov") + "\": File exists"));
}

TEST_F(FileRecording, ADanglingLinkCountsAsAnExistingCopy) {
  ASSERT_EQ(symlink("/nowhere/at/all", inRepository("NEW.mov").c_str()), 0);
  EXPECT_EQ(job_.addRecording(children_), 0);
  EXPECT_TRUE(std::filesystem::is_symlink(inRepository("NEW.mov")));
}

TEST_F(FileRecording, AMissingMovieIsADebugLineAndLeavesNothingTemporary) {
  std::filesystem::remove(elsewhere() + "/talk.mov");
  EXPECT_EQ(job_.addRecording(children_), 0);
  EXPECT_TRUE(log_.contains(kLogDebug, "\"" + elsewhere() + "/talk.mov\" was not copied to \"" +
                                           inRepository("NEW.mov") + "\": No such file or directory"));
  EXPECT_EQ(filesInRepository(), 3U);  // two from the fixture, plus the document
}

TEST_F(FileRecording, AMovieThatCannotBeReadLeavesNoHalfCopy) {
  std::filesystem::remove(elsewhere() + "/talk.mov");
  std::filesystem::create_directory(elsewhere() + "/talk.mov");  // can be opened but not read
  EXPECT_EQ(job_.addRecording(children_), 0);
  EXPECT_TRUE(log_.contains(kLogDebug, "\"" + elsewhere() + "/talk.mov\" was not copied to \"" +
                                           inRepository("NEW.mov") + "\": Is a directory"));
  EXPECT_EQ(filesInRepository(), 3U);
}

TEST_F(FileRecording, AnUnwritableRepositoryIsOneDebugLinePerFile) {
  context_->recording.recording_repository_path.set(kRoot_ + "/missing");
  EXPECT_EQ(job_.addRecording(children_), 0);
  EXPECT_EQ(children_.runs().size(), 1U);
  EXPECT_EQ(log_.entries().size(), 3U);
}

TEST_F(FileRecording, TheJobsOwnSessionDecidesWhatIsCopied) {
  auto own = std::make_shared<AgentRecord>();
  own->recordingType.set(kRecordingTypeVideo);
  job_.recorded = own;
  EXPECT_EQ(job_.addRecording(children_), 0);
  EXPECT_FALSE(std::filesystem::exists(inRepository("NEW.mov")));
}

TEST_F(FileRecording, AWorkflowWithoutPasswordIsStillCopied) {
  job_.adhoc_workflow_uuid = "W-1";
  EXPECT_EQ(job_.addRecording(children_), 1);
  EXPECT_EQ(contentOf(inRepository("NEW.mov")), movie_);
}

// Tests with a real child process.

class RealTool : public SubmissionJob {
 protected:
  static std::string tool() { return systemPath(kLumexTool); }
  static std::string argumentsFile() { return testing::kTestRoot.path() + "/arguments"; }
  static void installTool(const std::string& end) {
    std::filesystem::create_directories(directoryOf(tool()));
    write(tool(),
          "#!/bin/sh\nfor a in \"$@\"; do echo \"[$a]\"; done > '" + argumentsFile() + "'\n" + end + "\n");
    ASSERT_EQ(chmod(tool().c_str(), 0755), 0);
  }
};

TEST_F(RealTool, GetsItsArgumentsUnchanged) {
  installTool("exit 0");
  job_.properties = {{"RecordingMetadata_RECORDING_UUID", "A B'$(id)\"*"}};
  EXPECT_EQ(job_.addRecordingWithCommentary(systemChildRunner()), 0);
  EXPECT_EQ(contentOf(argumentsFile()),
            "[--server]\n[https://lumex.example]\n[--submit]\n[--recording]\n[A B'$(id)\"*]\n[--delete]\n");
}

TEST_F(RealTool, MayDeleteTheFiles) {
  installTool("rm '" + inRepository("ABC.mov") + "' '" + inRepository("ABC.xml") + "'");
  EXPECT_EQ(job_.addRecordingWithCommentary(systemChildRunner()), 0);
  EXPECT_EQ(filesInRepository(), 0U);
}

TEST_F(RealTool, ExitStatusThreeIsLoggedAndKeepsBothFiles) {
  installTool("exit 3");
  EXPECT_EQ(job_.addRecordingWithCommentary(systemChildRunner()), -1);
  EXPECT_TRUE(log_.contains(exitCode(3).level, exitCode(3).text));
  expectFilesKept();
}

TEST_F(RealTool, ASignalIsLoggedAsItsShellCode) {
  installTool("kill -TERM $$");
  EXPECT_EQ(job_.addRecording(systemChildRunner()), 1);
  EXPECT_TRUE(log_.contains(exitCode(143).level, exitCode(143).text));
}

TEST_F(RealTool, MissingToolIsNamedInTheLog) {
  EXPECT_EQ(job_.addRecordingWithCommentary(systemChildRunner()), -1);
  EXPECT_THAT(log_.entries(),
              ElementsAre(kStarting, kInProgress, kCommandLine,
                          Entry{kLogError, tool() + " could not be started: No such file or directory"},
                          kUnable, kIncomplete, kInternal));
}

}  // namespace
}  // namespace lmx
