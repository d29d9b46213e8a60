// START, STOP, PAUSE, RESUME, CANCEL, SERVER and X-PREVIEW: replies, marks, and what is asked of the main
// thread.
#include <gtest/gtest.h>

#include <limits>

#include "control/handlers/recording_configuration.h"
#include "record/agent_record.h"
#include "record/preview_controller.h"
#include "tests/unit/control/channel/scripted_channel.h"
#include "tests/unit/doubles/log_capture.h"
#include "tests/unit/doubles/scripted_actions.h"
#include "tests/unit/doubles/scripted_capture.h"

namespace lmx {
namespace {

using testing::Journal;
using testing::LogCapture;
using testing::ScriptedActions;
using testing::ScriptedCaptureController;
using testing::ScriptedChannel;
using Lines = std::vector<std::string>;

constexpr const char* kStart =
    "START RecordingMetadata_RECORDING_UUID=R1,RecordingMetadata_MAX_RECORDING_MINUTES=50,"
    "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=20,RecordingMetadata_TITLE=My Talk\n";

class RecordingHandlers : public ::testing::Test {
 protected:
  RecordingHandlers() { session_->captureController.set(capture_); }

  void setContinuous(bool enabled) {
    LMRContinuousRecordingInfo info;
    info.enabled = enabled;
    context_->recording.continuous.set(info);
  }
  Lines run(const std::string& line) {
    channel_.receive(line);
    return channel_.replies();
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
  ScriptedChannel channel_{context_, &actions_};
};

TEST_F(RecordingHandlers, StartPreparesThenMarksThenReplies) {
  const auto mark = onlyMark(kStart);
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"prepareCapture, waiting", "setStart"}));
  EXPECT_EQ(mark.uuid, session_->request_uuid.get());
  EXPECT_EQ(mark.uuid.size(), 36U);
  EXPECT_EQ(lookUp(mark.parameters, "RecordingMetadata_TITLE"), "My Talk");
}

TEST_F(RecordingHandlers, StartHandsItsPropertiesToContextAndSession) {
  run(kStart);
  EXPECT_EQ(lookUp(context_->state.properties.get(), "RecordingMetadata_RECORDING_UUID"), "R1");
  EXPECT_EQ(session_->request_properties.get(), context_->state.properties.get());
  EXPECT_EQ(session_->stop_times.maxUnattendedRecordingMinutes.get(), 20);
}

TEST_F(RecordingHandlers, StartPropertiesAreThereBeforeThePrepare) {
  std::optional<std::string> seen;
  actions_.on_prepare_capture = [&] {
    seen = lookUp(context_->state.properties.get(), "RecordingMetadata_TITLE");
  };
  run(kStart);
  EXPECT_EQ(seen, "My Talk");
}

TEST_F(RecordingHandlers, StartMarksTheShiftedTime) {
  context_->state.timeshift_seconds.set(300);
  onlyMark(kStart);
}

TEST_F(RecordingHandlers, StartRepliesWithTheStatusOfThePrepare) {
  context_->state.status.set(3);
  actions_.on_prepare_capture = [&] { context_->state.status.set(30); };
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=30"});
}

TEST_F(RecordingHandlers, StartClearsTheStatusOfAnEarlierAction) {
  context_->state.status.set(3);
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=0"});
}

TEST_F(RecordingHandlers, RefusedSecondStartStillReplacesTheRequestAndMarks) {
  run(kStart);
  const std::string first = session_->request_uuid.get();
  actions_.on_prepare_capture = [&] { context_->state.status.set(4); };
  EXPECT_EQ(run(kStart), (Lines{"cmdStatus=0", "cmdStatus=4"}));
  EXPECT_NE(session_->request_uuid.get(), first);
  ASSERT_EQ(capture_->marks().size(), 2U);
  EXPECT_EQ(capture_->marks()[1].uuid, session_->request_uuid.get());
}

TEST_F(RecordingHandlers, StartWithoutControllerHasNothingToMark) {
  session_->captureController.set(nullptr);
  actions_.on_prepare_capture = [&] { context_->state.status.set(3); };
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=3"});
}

TEST_F(RecordingHandlers, StartMarksOnTheControllerThatThePrepareMade) {
  auto made = std::make_shared<ScriptedCaptureController>(journal_);
  actions_.on_prepare_capture = [&] { session_->captureController.set(made); };
  run(kStart);
  EXPECT_TRUE(capture_->marks().empty());
  EXPECT_EQ(made->marks().size(), 1U);
}

TEST_F(RecordingHandlers, StartInContinuousModeOnlyMarks) {
  setContinuous(true);
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"setStart"});
}

TEST_F(RecordingHandlers, StartWhenTheMainLoopHasEndedIsNotReportedAsARecording) {
  actions_.loop_runs = false;
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=1"});
}

TEST_F(RecordingHandlers, StartWithoutARequiredParameterChangesNothing) {
  for (const char* line :
       {"START\n", "START RecordingMetadata_RECORDING_UUID=R1,RecordingMetadata_MAX_RECORDING_MINUTES=50\n",
        "START RecordingMetadata_RECORDING_UUID=R1,RecordingMetadata_UNATTENDED_RECORDING_MINUTES=20\n",
        "START "
        "RecordingMetadata_MAX_RECORDING_MINUTES=5,RecordingMetadata_UNATTENDED_RECORDING_MINUTES=2\n"}) {
    EXPECT_EQ(run(line).back(), "cmdStatus=31") << line;
  }
  EXPECT_EQ(channel_.replies().size(), 4U);
  EXPECT_TRUE(journal_.entries().empty());
  EXPECT_EQ(context_->state.properties.get(), nullptr);
  EXPECT_FALSE(session_->stop_times.hardStopTime.get().has_value());
  EXPECT_EQ(session_->request_uuid.get(), "");
}

TEST_F(RecordingHandlers, StartWithoutSessionStillReplies) {
  context_->releaseRecord();
  EXPECT_EQ(run(kStart), Lines{"cmdStatus=0"});
}

TEST_F(RecordingHandlers, OnlyTheExactTextTrueMakesAudioOnly) {
  session_->recordingType.set(kRecordingTypeAudioVideo);
  std::string line(kStart);
  line.insert(line.size() - 1, ",RecordingMetadata_AUDIO_ONLY=");
  for (const char* value : {"TRUE", "yes", "1", ""}) {
    run(std::string(line).insert(line.size() - 1, value));
    EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudioVideo) << value;
  }
  run(line.insert(line.size() - 1, "true"));
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudio);
  EXPECT_TRUE(log_.contains(7, "RecordingMetadata_AUDIO_ONLY: switching to audio-only recording type"));
}

TEST_F(RecordingHandlers, StopMarksThenAsksForTheStopWithoutWaiting) {
  session_->request_uuid.set("Q1");
  context_->state.timeshift_seconds.set(60);
  EXPECT_EQ(onlyMark("STOP\n").uuid, "Q1");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"setStop", "stopRecording"}));
}

TEST_F(RecordingHandlers, StopDoesNotCareForContinuousMode) {
  setContinuous(true);
  run("STOP\n");
  EXPECT_EQ(journal_.entries(), (Lines{"setStop", "stopRecording"}));
}

TEST_F(RecordingHandlers, PauseMarksBeforeItPauses) {
  session_->request_uuid.set("Q1");
  const auto mark = onlyMark("PAUSE\n");
  EXPECT_EQ(mark.operation + " " + mark.uuid, "setStop Q1");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"setStop", "pauseCapture, waiting"}));
}

TEST_F(RecordingHandlers, PauseInContinuousModeOnlyMarks) {
  setContinuous(true);
  EXPECT_EQ(run("PAUSE\n"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"setStop"});
}

TEST_F(RecordingHandlers, ResumeMarksAfterItHasResumed) {
  session_->request_uuid.set("Q1");
  const auto mark = onlyMark("RESUME\n");
  EXPECT_EQ(mark.operation + " " + mark.uuid, "setStart Q1");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"resumeCapture, waiting", "setStart"}));
}

TEST_F(RecordingHandlers, ResumeInContinuousModeOnlyMarks) {
  setContinuous(true);
  EXPECT_EQ(run("RESUME\n"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"setStart"});
}

TEST_F(RecordingHandlers, CancelCancelsTheRequestAndTheCaptureWithoutWaiting) {
  session_->request_uuid.set("Q1");
  EXPECT_EQ(onlyMark("CANCEL\n").uuid, "Q1");
  EXPECT_EQ(channel_.replies(), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), (Lines{"cancelRequest", "cancelCapture"}));
}

TEST_F(RecordingHandlers, CancelInContinuousModeOnlyCancelsTheRequest) {
  setContinuous(true);
  EXPECT_EQ(run("CANCEL\n"), Lines{"cmdStatus=0"});
  EXPECT_EQ(journal_.entries(), Lines{"cancelRequest"});
}

TEST_F(RecordingHandlers, WithoutSessionTheRecordingCommandsAnswerOne) {
  context_->releaseRecord();
  for (const char* line : {"STOP\n", "PAUSE\n", "RESUME\n", "CANCEL\n"}) {
    EXPECT_EQ(run(line).back(), "cmdStatus=1") << line;
  }
  EXPECT_TRUE(journal_.entries().empty());
}

TEST_F(RecordingHandlers, WithoutControllerTheyStillActAndReply) {
  session_->captureController.set(nullptr);
  for (const char* line : {"STOP\n", "PAUSE\n", "RESUME\n", "CANCEL\n"}) {
    EXPECT_EQ(run(line).back(), "cmdStatus=0") << line;
  }
  EXPECT_EQ(journal_.entries(),
            (Lines{"stopRecording", "pauseCapture, waiting", "resumeCapture, waiting", "cancelCapture"}));
}

TEST_F(RecordingHandlers, WithoutActionsTheyStillReply) {
  ScriptedChannel channel(context_, nullptr);
  for (const char* line : {kStart, "STOP\n", "PAUSE\n", "RESUME\n", "CANCEL\n"}) channel.receive(line);
  EXPECT_EQ(channel.replies(), Lines(5, "cmdStatus=0"));
}

TEST_F(RecordingHandlers, ServerSetsTheVersionWithoutReplyEvenWhenTheUuidDiffers) {
  context_->server.server_uuid.set("S1");
  EXPECT_TRUE(run("SERVER version=2,server_uuid=X\n").empty());
  EXPECT_EQ(channel_.serverProtocolVersion(), 2);
  EXPECT_TRUE(log_.contains(6, "Server UUID does not match"));
}

TEST_F(RecordingHandlers, ServerOfOurOwnIsNamedInTheLog) {
  context_->server.server_uuid.set("S1");
  EXPECT_TRUE(run("SERVER version=3,server_uuid=S1\n").empty());
  EXPECT_EQ(channel_.serverProtocolVersion(), 3);
  EXPECT_TRUE(log_.contains(6, "Server is: S1"));
}

TEST_F(RecordingHandlers, ServerWithoutAParameterIsRefused) {
  EXPECT_EQ(run("SERVER version=2\n"), Lines{"cmdStatus=31"});
  EXPECT_EQ(run("SERVER server_uuid=S1\n").size(), 2U);
  EXPECT_EQ(run("SERVER\n"), Lines(3, "cmdStatus=31"));
  EXPECT_EQ(channel_.serverProtocolVersion(), 0);
}

TEST_F(RecordingHandlers, XPreviewChangesTheIntervalWithoutReply) {
  auto preview =
      std::make_shared<MyLMRPreviewController>(std::make_unique<testing::ScriptedPreviewController>());
  auto delegate = std::make_shared<MyLMRPreviewControllerDelegate>(400);
  preview->setDelegate(delegate);
  session_->previewController.set(preview);
  EXPECT_TRUE(run("X-PREVIEW refresh_milliseconds=500\n").empty());
  EXPECT_EQ(delegate->frameGrabInterval(), 500);
  EXPECT_TRUE(run("X-PREVIEW\n").empty());
  EXPECT_TRUE(run("X-FOO refresh_milliseconds=100\n").empty());
  EXPECT_EQ(delegate->frameGrabInterval(), 500);
}

TEST_F(RecordingHandlers, XPreviewWithoutPreviewControllerDoesNothing) {
  EXPECT_TRUE(run("X-PREVIEW refresh_milliseconds=500\n").empty());
}

TEST_F(RecordingHandlers, StartAfterTheChannelHasStoppedItselfIsNotAnswered) {
  channel_.stop();
  EXPECT_TRUE(run(kStart).empty());
  EXPECT_TRUE(log_.contains(3, "handleSTART: No agent context"));
}

struct MinutesCase {
  const char* minutes;
  std::int32_t seconds;
};

TEST(HardStop, MinutesBecomeSeconds) {
  constexpr auto kMost = std::numeric_limits<std::int32_t>::max();
  for (const MinutesCase& c : {MinutesCase{"1.5", 90},
                               {"0.01", 1},
                               {"90.5", 5430},
                               {"0", 0},
                               {"-1", 0},
                               {"0.008", 0},
                               {"0.0084", 1},
                               {"", 0},
                               {"soon", 0},
                               {"nan", 0},
                               {"inf", 0},
                               {"-inf", 0},
                               {"1e400", 0},
                               {"1e300", kMost},
                               {"35791394.1", 2147483646},
                               {"35791394.2", kMost},
                               {"50 minutes", 3000}}) {
    EXPECT_EQ(hardStopSeconds(c.minutes), c.seconds) << c.minutes;
  }
}

class Configure : public ::testing::Test {
 protected:
  /// Seconds from now to the hard stop; -1 when there is none.
  std::int64_t hardStopIn() {
    const auto stop = context_->record_context()->stop_times.hardStopTime.get();
    return stop ? std::int64_t{stop->tv_sec} - std::int64_t{lmp_gettimeofday()->tv_sec} : -1;
  }
  LogCapture log_;
  std::shared_ptr<AgentContext> context_ = newAgentContext();
  ScriptedChannel channel_{context_, nullptr};
};

TEST_F(Configure, NoneIsRefused) { EXPECT_EQ(channel_.configure(nullptr), 1); }

TEST_F(Configure, MaximumMinutesSetTheHardStop) {
  const Dictionary minutes{{"RecordingMetadata_MAX_RECORDING_MINUTES", "1.5"}};
  EXPECT_EQ(channel_.configure(&minutes), 0);
  EXPECT_GE(hardStopIn(), 89);
  EXPECT_LE(hardStopIn(), 90);
}

TEST_F(Configure, AHundredthOfAMinuteIsOneSecond) {
  const Dictionary minutes{{"RecordingMetadata_MAX_RECORDING_MINUTES", "0.01"}};
  channel_.configure(&minutes);
  EXPECT_GE(hardStopIn(), 0);
  EXPECT_LE(hardStopIn(), 1);
}

TEST_F(Configure, EmptyValuesLeaveEverythingAsItWas) {
  const Dictionary full{{"RecordingMetadata_MAX_RECORDING_MINUTES", "5"},
                        {"RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "7"},
                        {"RecordingMetadata_AGENT_USERNAME", "bob"},
                        {"RecordingMetadata_AGENT_PASSWORD", "sesame"}};
  Dictionary empty = full;
  for (auto& [key, value] : empty) value.clear();
  channel_.configure(&full);
  channel_.configure(&empty);
  EXPECT_GE(hardStopIn(), 0);
  EXPECT_EQ(context_->record_context()->stop_times.maxUnattendedRecordingMinutes.get(), 7);
  EXPECT_EQ(context_->options.user.get(), "bob");
  EXPECT_EQ(context_->options.password.get(), "sesame");
}

TEST_F(Configure, PropertiesAreReplacedNotMerged) {
  const Dictionary first{{"a", "1"}};
  const Dictionary second{{"b", "2"}};
  channel_.configure(&first);
  channel_.configure(&second);
  EXPECT_EQ(*channel_.properties.get(), second);
}

TEST_F(RecordingHandlers, AMovieCannotBeNamedOutOfTheRepository) {
  EXPECT_EQ(
      run("START RecordingMetadata_RECORDING_UUID=../../etc/x,RecordingMetadata_MAX_RECORDING_MINUTES=5,"
          "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=5\n"),
      Lines{"cmdStatus=31"});
  EXPECT_TRUE(journal_.entries().empty());
}

TEST_F(RecordingHandlers, StartForgetsDeadlinesOfAnEarlierRecordingOnly) {
  const auto inAnHour = std::time(nullptr) + 3600;
  session_->stop_times.softStopTime.set(TimeValue{inAnHour, 0});
  session_->stop_times.hardStopTime.set(TimeValue{inAnHour, 0});
  run("START RecordingMetadata_RECORDING_UUID=R,RecordingMetadata_MAX_RECORDING_MINUTES=0,"
      "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=0\n");
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

}  // namespace
}  // namespace lmx
