// START, STOP, PAUSE, RESUME, CANCEL: replies, marks, and what is asked of the main thread.
#include "control/handlers/recording_commands.h"

#include <gtest/gtest.h>

#include <map>

#include "control/protocol/command_parser.h"
#include "record/agent_record.h"
#include "tests/unit/control/handlers/collected_replies.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/scripted_capture.h"

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

TEST_F(RecordingCommandsTest, StartPreparesThenMarksThenReplies) {
  const auto mark = onlyMark(kStart);
  EXPECT_EQ(replies_.all(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"prepareCapture, waiting", "setStart"}));
  EXPECT_EQ(mark.uuid, session_->request_uuid.get());
  EXPECT_EQ(mark.uuid.size(), 36U);
  EXPECT_EQ(lookUp(mark.parameters, "RecordingMetadata_TITLE"), "My Talk");
}

TEST_F(RecordingCommandsTest, StartHandsItsPropertiesToContextAndSession) {
  run(kStart);
  EXPECT_EQ(lookUp(context_->state.properties.get(), "RecordingMetadata_RECORDING_UUID"), "R1");
  EXPECT_EQ(session_->request_properties.get(), context_->state.properties.get());
  EXPECT_EQ(session_->stop_times.maxUnattendedRecordingMinutes.get(), 20);
}

TEST_F(RecordingCommandsTest, StartPropertiesAreThereBeforeThePrepare) {
  std::optional<std::string> seen;
  actions_.on_prepare_capture = [&] {
    seen = lookUp(context_->state.properties.get(), "RecordingMetadata_TITLE");
  };
  run(kStart);
  EXPECT_EQ(seen, "My Talk");
}

TEST_F(RecordingCommandsTest, StartMarksTheShiftedTime) {
  context_->state.timeshift_seconds.set(300);
  onlyMark(kStart);
}

TEST_F(RecordingCommandsTest, StartRepliesWithTheStatusOfThePrepare) {
  context_->state.status.set(3);
  actions_.on_prepare_capture = [&] { context_->state.status.set(30); };
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=30"});
}

TEST_F(RecordingCommandsTest, StartClearsTheStatusOfAnEarlierAction) {
  context_->state.status.set(3);
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=0"});
}

TEST_F(RecordingCommandsTest, RefusedSecondStartStillReplacesTheRequestAndMarks) {
  run(kStart);
  const std::string first = session_->request_uuid.get();
  actions_.on_prepare_capture = [&] { context_->state.status.set(4); };
  EXPECT_EQ(run(kStart), (Lines{"cmdStatus=0", "cmdStatus=4"}));
  EXPECT_NE(session_->request_uuid.get(), first);
  ASSERT_EQ(capture_->marks().size(), 2U);
  EXPECT_EQ(capture_->marks()[1].uuid, session_->request_uuid.get());
}

TEST_F(RecordingCommandsTest, StartWithoutControllerHasNothingToMark) {
  session_->captureController.set(nullptr);
  actions_.on_prepare_capture = [&] { context_->state.status.set(3); };
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=3"});
}

TEST_F(RecordingCommandsTest, StartMarksOnTheControllerThatThePrepareMade) {
  auto made = std::make_shared<ScriptedCaptureController>(journal_);
  actions_.on_prepare_capture = [&] { session_->captureController.set(made); };
  run(kStart);
  EXPECT_TRUE(capture_->marks().empty());
  EXPECT_EQ(made->marks().size(), 1U);
}

TEST_F(RecordingCommandsTest, StartInContinuousModeOnlyMarks) {
  setContinuous(true);
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"setStart"});
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
  EXPECT_EQ(session_->request_uuid.get(), "");
}

TEST_F(RecordingCommandsTest, StartWithoutSessionStillReplies) {
  context_->releaseRecord();
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=0"});
}

TEST_F(RecordingCommandsTest, OnlyTheExactTextTrueMakesAudioOnly) {
  session_->recordingType.set(kRecordingTypeAudioVideo);
  std::string line(kStart);
  line.append(",RecordingMetadata_AUDIO_ONLY=");
  for (const char* value : {"TRUE", "yes", "1", ""}) {
    run(line + value);
    EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudioVideo) << value;
  }
  run(line + "true");
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudio);
  EXPECT_TRUE(
      log_.contains(kLogDebug, "RecordingMetadata_AUDIO_ONLY: switching to audio-only recording type"));
}

TEST_F(RecordingCommandsTest, StopMarksThenAsksForTheStopWithoutWaiting) {
  session_->request_uuid.set("Q1");
  context_->state.timeshift_seconds.set(60);
  EXPECT_EQ(onlyMark("STOP").uuid, "Q1");
  EXPECT_EQ(replies_.all(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"setStop", "stopRecording"}));
}

TEST_F(RecordingCommandsTest, StopDoesNotCareForContinuousMode) {
  setContinuous(true);
  run("STOP");
  EXPECT_EQ(journal_.entries(), (Lines{"setStop", "stopRecording"}));
}

TEST_F(RecordingCommandsTest, PauseMarksBeforeItPauses) {
  session_->request_uuid.set("Q1");
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
  session_->request_uuid.set("Q1");
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
  session_->request_uuid.set("Q1");
  EXPECT_EQ(onlyMark("CANCEL").uuid, "Q1");
  EXPECT_EQ(replies_.all(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"cancelRequest", "cancelCapture"}));
}

TEST_F(RecordingCommandsTest, CancelInContinuousModeOnlyCancelsTheRequest) {
  setContinuous(true);
  EXPECT_EQ(run("CANCEL"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"cancelRequest"});
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
            (Lines{"stopRecording", "pauseCapture, waiting", "resumeCapture, waiting", "cancelCapture"}));
}

TEST_F(RecordingCommandsTest, WithoutActionsTheyStillReply) {
  RecordingCommands commands(held_, nullptr, replies_);
  const Command start = parseCommand(kStart);
  commands.handleSTART(&*start.parameters);
  commands.handleSTOP(nullptr);
  commands.handlePAUSE(nullptr);
  commands.handleRESUME(nullptr);
  commands.handleCANCEL(nullptr);
  EXPECT_EQ(replies_.all(), Lines(5, "cmdStatus=0"));
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

TEST_F(RecordingCommandsTest, StartForgetsDeadlinesOfAnEarlierRecordingOnly) {
  const auto inAnHour = std::time(nullptr) + 3600;
  session_->stop_times.softStopTime.set(TimeValue{inAnHour, 0});
  session_->stop_times.hardStopTime.set(TimeValue{inAnHour, 0});
  run("START RecordingMetadata_RECORDING_UUID=R,RecordingMetadata_MAX_RECORDING_MINUTES=0,"
      "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=0");
  EXPECT_FALSE(session_->stop_times.hardStopTime.get()) << "that of the recording before";
  EXPECT_FALSE(session_->stop_times.softStopTime.get());
  run(kStart);
  const auto own = session_->stop_times.hardStopTime.get();
  EXPECT_TRUE(own);
  EXPECT_FALSE(session_->stop_times.softStopTime.get());
  session_->status.set(kRecorderRecording);
  session_->stop_times.softStopTime.set(TimeValue{1000, 0});
  run(kStart);
  EXPECT_NE(session_->stop_times.softStopTime.get().value_or(TimeValue{}).tv_sec, 0)
      << "a running one keeps its deadline";
}

TEST_F(RecordingCommandsTest, NoPropertiesAreRefused) { EXPECT_EQ(commands_.configure(nullptr), 1); }

TEST_F(RecordingCommandsTest, PropertiesAreReplacedNotMerged) {
  const Dictionary first{{"a", "1"}};
  const Dictionary second{{"b", "2"}};
  EXPECT_EQ(commands_.configure(&first), 0);
  EXPECT_EQ(commands_.configure(&second), 0);
  EXPECT_EQ(*commands_.properties.get(), second);
}

}  // namespace
}  // namespace lmx
