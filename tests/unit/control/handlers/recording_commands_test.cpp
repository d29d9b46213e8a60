// START, STOP, PAUSE, RESUME, CANCEL: replies, marks, and what is asked of the main thread.
#include "control/handlers/recording_commands.h"

#include <gtest/gtest.h>

#include <atomic>
#include <map>
#include <thread>

#include "control/protocol/command_parser.h"
#include "record/agent_record.h"
#include "tests/unit/control/handlers/collected_replies.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/scripted_capture.h"
#include "tests/unit/doubles/wait_until.h"

namespace lmx {
namespace {

using testing::CollectedReplies;
using testing::Journal;
using testing::LogCapture;
using testing::ScriptedActions;
using testing::ScriptedCaptureController;
using Lines = std::vector<std::string>;

constexpr const char* kStart =
    "START RecordingMetadata_RECORDING_UUID=R1,RecordingMetadata_MAX_RECORDING_MINUTES=50,"
    "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=20,RecordingMetadata_TITLE=My Talk";

class RecordingCommandsTest : public ::testing::Test {
 protected:
  RecordingCommandsTest() { session_->captureController.set(capture_); }

  void setContinuous(bool enabled) {
    LMRContinuousRecordingInfo info;
    info.enabled = enabled;
    context_->recording.continuous.set(info);
  }
  /// @return all replies so far
  Lines run(const std::string& line) {
    static const std::map<std::string, void (RecordingCommands::*)(const Dictionary*)> kHandlers{
        {"START", &RecordingCommands::handleSTART},   {"STOP", &RecordingCommands::handleSTOP},
        {"PAUSE", &RecordingCommands::handlePAUSE},   {"RESUME", &RecordingCommands::handleRESUME},
        {"CANCEL", &RecordingCommands::handleCANCEL},
    };
    const Command command = parseCommand(line);
    (commands_.*kHandlers.at(command.verb))(command.parameters ? &*command.parameters : nullptr);
    return replies_.all();
  }
  /// Runs `line` and expects its one mark to carry the time at which it ran, less the shift of the context.
  ScriptedCaptureController::Mark onlyMark(const std::string& line) {
    const double before = secondsSinceReferenceDate() - context_->state.timeshift_seconds.get();
    run(line);
    const double after = secondsSinceReferenceDate() - context_->state.timeshift_seconds.get();
    const auto marks = capture_->marks();
    EXPECT_EQ(marks.size(), 1U);
    if (marks.empty()) return {};
    if (marks[0].time) {
      EXPECT_GE(*marks[0].time, before);
      EXPECT_LE(*marks[0].time, after);
    }
    return marks[0];
  }

  LogCapture log_;
  Journal journal_;
  ScriptedActions actions_{journal_};
  std::shared_ptr<ScriptedCaptureController> capture_ = std::make_shared<ScriptedCaptureController>(journal_);
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  std::shared_ptr<AgentRecord> session_ = context_->record_context();
  ChannelContext held_{context_};
  CollectedReplies replies_;
  RecordingCommands commands_{held_, &actions_, replies_};
};

TEST_F(RecordingCommandsTest, StartHandsItsParametersToTheAgentAndRepliesWithTheResult) {
  actions_.start_result = 30;
  context_->state.status.set(3);  // another action's
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=30"});
  EXPECT_EQ(journal_.entries(), Lines{"performStart"});
  ASSERT_EQ(actions_.started.size(), 1U);
  EXPECT_EQ(lookUp(actions_.started[0], "RecordingMetadata_TITLE"), "My Talk");
  EXPECT_EQ(lookUp(actions_.started[0], "RecordingMetadata_RECORDING_UUID"), "R1");
}

TEST_F(RecordingCommandsTest, StartWhenTheMainLoopHasEndedIsNotReportedAsARecording) {
  actions_.loop_runs = false;
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=1"});
}

TEST_F(RecordingCommandsTest, StartWithoutARequiredParameterChangesNothing) {
  for (const char* line :
       {"START", "START RecordingMetadata_RECORDING_UUID=R1,RecordingMetadata_MAX_RECORDING_MINUTES=50",
        "START RecordingMetadata_RECORDING_UUID=R1,RecordingMetadata_UNATTENDED_RECORDING_MINUTES=20",
        "START "
        "RecordingMetadata_MAX_RECORDING_MINUTES=5,RecordingMetadata_UNATTENDED_RECORDING_MINUTES=2"}) {
    EXPECT_EQ(run(line).back(), "cmdStatus=31") << line;
  }
  EXPECT_EQ(replies_.all().size(), 4U);
  EXPECT_TRUE(journal_.entries().empty());
  EXPECT_EQ(context_->state.properties.get(), nullptr);
  EXPECT_FALSE(session_->stop_times.hardStopTime.get().has_value());
}

TEST_F(RecordingCommandsTest, StopMarksThenAsksForTheStopWithoutWaiting) {
  session_->request.set({.uuid = "Q1"});
  context_->state.timeshift_seconds.set(60);
  const double before = secondsSinceReferenceDate() - 60;
  EXPECT_EQ(run("STOP"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"setStop", "submitRequest", "stopRecording", "syncMarks"}));
  for (const auto& mark : capture_->marks()) EXPECT_EQ(mark.uuid, "Q1");
  EXPECT_GE(capture_->marks().at(0).time.value_or(0), before);
  EXPECT_LE(capture_->marks().at(0).time.value_or(0), before + 30);
}

TEST_F(RecordingCommandsTest, StopIsOnTheDiskBeforeItsReply) {
  bool synced = false;
  replies_.on_reply = [&] { synced = journal_.entries().back() == "syncMarks"; };
  run("STOP");
  EXPECT_TRUE(synced);
}

TEST_F(RecordingCommandsTest, TheMainThreadDoesNotWaitForTheDisk) {
  actions_.is_main_thread = true;
  const auto caller = std::this_thread::get_id();
  std::atomic<bool> elsewhere{false};
  capture_->on_sync_marks = [&] { elsewhere = std::this_thread::get_id() != caller; };
  EXPECT_EQ(run("STOP"), Lines{"cmdStatus=0"});
  EXPECT_TRUE(testing::waitUntil([&] { return elsewhere.load(); }));
}

TEST_F(RecordingCommandsTest, StopDoesNotCareForContinuousMode) {
  setContinuous(true);
  run("STOP");
  EXPECT_EQ(journal_.entries(), (Lines{"setStop", "submitRequest", "stopRecording", "syncMarks"}));
}

TEST_F(RecordingCommandsTest, PauseMarksBeforeItPauses) {
  session_->request.set({.uuid = "Q1"});
  const auto mark = onlyMark("PAUSE");
  EXPECT_EQ(mark.operation + " " + mark.uuid, "setStop Q1");
  EXPECT_EQ(replies_.all(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"setStop", "pauseCapture, waiting"}));
}

TEST_F(RecordingCommandsTest, PauseInContinuousModeOnlyMarks) {
  setContinuous(true);
  EXPECT_EQ(run("PAUSE"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"setStop"});
}

TEST_F(RecordingCommandsTest, ResumeMarksAfterItHasResumed) {
  session_->request.set({.uuid = "Q1"});
  const auto mark = onlyMark("RESUME");
  EXPECT_EQ(mark.operation + " " + mark.uuid, "setStart Q1");
  EXPECT_EQ(replies_.all(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"resumeCapture, waiting", "setStart"}));
}

TEST_F(RecordingCommandsTest, ResumeInContinuousModeOnlyMarks) {
  setContinuous(true);
  EXPECT_EQ(run("RESUME"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"setStart"});
}

TEST_F(RecordingCommandsTest, CancelCancelsTheRequestAndTheCaptureWithoutWaiting) {
  session_->request.set({.uuid = "Q1"});
  EXPECT_EQ(onlyMark("CANCEL").uuid, "Q1");
  EXPECT_EQ(replies_.all(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"cancelRequest", "cancelRecording"}));
}

TEST_F(RecordingCommandsTest, CancelInContinuousModeOnlyCancelsTheRequest) {
  setContinuous(true);
  EXPECT_EQ(run("CANCEL"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"cancelRequest"});
}

TEST_F(RecordingCommandsTest, CommandsAreAboutTheRequestOfTheirArrival) {
  session_->request.set({.uuid = "Q1"});
  for (const char* line : {"STOP", "PAUSE", "RESUME", "CANCEL"}) run(line);
  EXPECT_EQ(actions_.addressed, Lines(4, "Q1"));
}

/// The START being prepared is what a technician who presses STOP has in mind.
TEST_F(RecordingCommandsTest, AStopDuringAPreparationWaitsForItAndEndsThat) {
  session_->request.set({.uuid = "Q1"});
  session_->preparing_request.set("Q2");
  auto made = std::make_shared<ScriptedCaptureController>(journal_);
  actions_.on_stop_recording = [&] { session_->captureController.set(made); };
  EXPECT_EQ(run("STOP"), Lines{"cmdStatus=0"});
  EXPECT_EQ(actions_.addressed, Lines{"Q2"});
  EXPECT_EQ(journal_.entries(), (Lines{"stopRecording, waiting", "submitRequest", "syncMarks"}));
  EXPECT_TRUE(capture_->marks().empty()) << "the recording before is none of its business";
  EXPECT_EQ(made->marks().at(0).uuid, "Q2");
}

/// Only the job keeps it.
TEST_F(RecordingCommandsTest, AStopOfAFileWaitsForItsJob) {
  session_->captureController.set(nullptr);
  session_->setRecordedType(kRecordingTypeFile);
  EXPECT_EQ(run("STOP"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"stopRecording, waiting"});
}

TEST_F(RecordingCommandsTest, AResumeForAnEarlierRecordingMarksNothing) {
  session_->request.set({.uuid = "Q1"});
  actions_.on_resume_capture = [&] { session_->request.set({.uuid = "Q2"}); };
  EXPECT_EQ(run("RESUME"), Lines{"cmdStatus=0"});
  EXPECT_TRUE(capture_->marks().empty());
}

TEST_F(RecordingCommandsTest, WithoutSessionTheRecordingCommandsAnswerOne) {
  context_->releaseRecord();
  for (const char* line : {"STOP", "PAUSE", "RESUME", "CANCEL"}) {
    EXPECT_EQ(run(line).back(), "cmdStatus=1") << line;
  }
  EXPECT_TRUE(journal_.entries().empty());
}

TEST_F(RecordingCommandsTest, WithoutControllerTheyStillActAndReply) {
  session_->captureController.set(nullptr);
  for (const char* line : {"STOP", "PAUSE", "RESUME", "CANCEL"}) {
    EXPECT_EQ(run(line).back(), "cmdStatus=0") << line;
  }
  EXPECT_EQ(journal_.entries(),
            (Lines{"stopRecording", "pauseCapture, waiting", "resumeCapture, waiting", "cancelRecording"}));
}

TEST_F(RecordingCommandsTest, WithoutActionsTheyStillReply) {
  RecordingCommands commands(held_, nullptr, replies_);
  const Command start = parseCommand(kStart);
  commands.handleSTART(&*start.parameters);
  commands.handleSTOP(nullptr);
  commands.handlePAUSE(nullptr);
  commands.handleRESUME(nullptr);
  commands.handleCANCEL(nullptr);
  EXPECT_EQ(replies_.all(),
            (Lines{"cmdStatus=1", "cmdStatus=0", "cmdStatus=0", "cmdStatus=0", "cmdStatus=0"}))
      << "nobody has started anything";
}

TEST_F(RecordingCommandsTest, StartAfterTheChannelHasStoppedItselfIsNotAnswered) {
  held_.release();
  EXPECT_TRUE(run(kStart).empty());
  EXPECT_TRUE(log_.contains(kLogError, "handleSTART: No agent context"));
}

TEST_F(RecordingCommandsTest, AMovieCannotBeNamedOutOfTheRepository) {
  EXPECT_EQ(
      run("START RecordingMetadata_RECORDING_UUID=../../etc/x,RecordingMetadata_MAX_RECORDING_MINUTES=5,"
          "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=5"),
      Lines{"cmdStatus=31"});
  EXPECT_TRUE(journal_.entries().empty());
}

}  // namespace
}  // namespace lmx
