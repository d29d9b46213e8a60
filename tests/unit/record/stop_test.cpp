// Stopping a recording through the engine, and the recorder's status.
#include <chrono>

#include "record/recording_status.h"
#include "record/stop_capture.h"
#include "tests/unit/record/engine_fixture.h"

namespace lmx {
namespace {

using testing::ScriptedCaptureController;

/// A session that records with the test's own controller.
class Stop : public EngineTest {
 protected:
  Stop() {
    session_->captureController.set(controller_);
    session_->filename.set(movie("R1.mov"));
    session_->status.set(kRecorderRecording);
    session_->recording_uuid.set("U");
    session_->elapsedTime.set(TimeValue{});
    session_->startTime.set(lmp_gettimeofday());
    controller_->shut_down = true;
    controller_->elapsed_of_request = 12.9;
    actions_.on_stop_capture = [this] { session_->status.set(kRecorderIdle); };
  }
  std::shared_ptr<ScriptedCaptureController> controller_ =
      std::make_shared<ScriptedCaptureController>(journal_);
};

TEST_F(Stop, SetsTheMarkStopsTheCaptureAndReportsWholeSeconds) {
  EXPECT_EQ(LXAgentRecordStopCapture(session_), 0);
  EXPECT_EQ(journal_.entries(),
            (Entries{"setStop", "stopCapture", "recordDidStop " + movie("R1.mov") + " 12"}));
  EXPECT_EQ(controller_->marks()[0].uuid, "U");
  EXPECT_TRUE(session_->stopTime.get());
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
}

TEST_F(Stop, ElapsedTimeGrowsByTheTimeSinceTheStart) {
  auto start = *lmp_gettimeofday();
  start.tv_sec -= 100;
  session_->startTime.set(start);
  session_->elapsedTime.set(TimeValue{50, 0});
  ASSERT_EQ(LXAgentRecordStopCapture(session_), 0);
  EXPECT_GE(session_->elapsedTime.get()->tv_sec, 150);
  EXPECT_LE(session_->elapsedTime.get()->tv_sec, 152);
}

TEST_F(Stop, WithoutASessionReturnsTwo) {
  EXPECT_EQ(LXAgentRecordStopCapture(nullptr), 2);
  EXPECT_TRUE(log_.contains(kLogError, "Invalid Arguments in function LXAgentRecordStopCapture"));
}

TEST_F(Stop, WithoutARecordingReturnsThree) {
  session_->status.set(kRecorderIdle);
  EXPECT_EQ(LXAgentRecordStopCapture(session_), 3);
  EXPECT_TRUE(log_.contains(kLogError, "Unable to stop, capture not running"));
  EXPECT_EQ(journal_.entries(), (Entries{"setStop", "recordRuntimeError 3"}));
  EXPECT_EQ(session_->error.get(), 3);
}

TEST_F(Stop, StopsAPausedRecording) {
  session_->status.set(kRecorderPaused);
  EXPECT_EQ(LXAgentRecordStopCapture(session_), 0);
}

TEST_F(Stop, UnknownTypeReturnsOne) {
  session_->recordingType.set(9);
  EXPECT_EQ(LXAgentRecordStopCapture(session_), 1);
  EXPECT_EQ(journal_.entries(), (Entries{"setStop", "recordRuntimeError 1"}));
  EXPECT_EQ(session_->error.get(), 1);
}

TEST_F(Stop, AgentStatusIsTheResult) {
  struct Row {
    int agent_status;
    bool logged;
  };
  for (const Row& row : {Row{26, false}, Row{3, true}}) {
    session_->status.set(kRecorderRecording);
    context_->state.status.set(row.agent_status);
    EXPECT_EQ(LXAgentRecordStopCapture(session_), row.agent_status);
    EXPECT_EQ(session_->error.get(), row.agent_status);
    EXPECT_EQ(log_.contains(kLogError, "_LXAgentRecordStopCaptureSync received error"), row.logged);
  }
  EXPECT_EQ(journalCount("recordDidStop " + movie("R1.mov") + " 12"), 0);
}

TEST_F(Stop, FileRecordingNeedsNoMainThread) {
  session_->recordingType.set(kRecordingTypeFile);
  session_->captureController.set(nullptr);
  EXPECT_EQ(LXAgentRecordStopCapture(session_), 0);
  EXPECT_EQ(journal_.entries(), (Entries{"recordDidStop " + movie("R1.mov") + " 0"}));
}

TEST_F(Stop, AdhocStopsTheControllerDirectly) {
  context_->options.adhoc.set(true);
  EXPECT_EQ(LXAgentRecordStopCapture(session_), 0);
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  EXPECT_EQ(journalCount("stopCapture"), 0);
}

/// Slow, because the ten-second limit is part of the behaviour.
TEST_F(Stop, GivesUpAfterTenSecondsWhenTheControllerNeverShutsDown) {
  controller_->shut_down = false;
  const auto before = std::chrono::steady_clock::now();
  EXPECT_EQ(LXAgentRecordStopCapture(session_), 0);
  const auto took = std::chrono::steady_clock::now() - before;
  EXPECT_GE(took, std::chrono::milliseconds(9900));
  EXPECT_LT(took, std::chrono::seconds(13));
}

TEST_F(EngineTest, ACaptureThatFailsToStartIsStopped) {
  actions_.on_stop_capture = [this] {
    session_->status.set(kRecorderIdle);
    endCaptures();
  };
  framework_->on_new_controller = [](auto& controller) { controller.start_succeeds = false; };
  ASSERT_EQ(prepare(), 0);
  EXPECT_TRUE(log_.waitFor(kLogCritical, "The recording failed to start"));
  EXPECT_TRUE(
      testing::waitUntil([&] { return journalCount("recordDidStop " + movie("R1.mov") + " 0") == 1; }));
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
}

TEST_F(Stop, StatusComesFromTheControllersState) {
  const std::pair<int, int> rows[] = {{0, 0}, {1, 0}, {2, 0}, {3, 2}, {4, 1}, {5, 0}};
  controller_->elapsed_milliseconds = 12999;
  for (const auto& [state, expected] : rows) {
    controller_->state = state;
    RecordStatus status;
    EXPECT_EQ(LXAgentRecordGetStatus(session_, &status), 0);
    EXPECT_EQ(status.recordStatus, expected) << state;
    EXPECT_EQ(status.elapsedSeconds, 12);
  }
}

TEST_F(Stop, StatusHasTheLastSecondThatFitsForAHardStopBeyondThat) {
  session_->stop_times.hardStopTime.set(TimeValue{4000000000, 0});
  RecordStatus status;
  EXPECT_EQ(LXAgentRecordGetStatus(session_, &status), 0);
  EXPECT_EQ(status.hardStop, 2147483647);
}

TEST_F(Stop, StatusKeepsOutputsOfUnsetTimes) {
  RecordStatus status{.start = 11, .stop = 12, .hardStop = 13};
  EXPECT_EQ(LXAgentRecordGetStatus(session_, &status), 0);
  EXPECT_EQ(status.start, 11);
  EXPECT_EQ(status.stop, 12);
  EXPECT_EQ(status.hardStop, 13);
}

TEST_F(Stop, StatusReportsTimesErrorAndSpace) {
  session_->launchTime.set(TimeValue{101, 5});
  session_->stopTime.set(TimeValue{102, 5});
  session_->stop_times.hardStopTime.set(TimeValue{103, 5});
  session_->error.set(30);
  RecordStatus status;
  EXPECT_EQ(LXAgentRecordGetStatus(session_, &status), 0);
  EXPECT_EQ(status.start, 101);
  EXPECT_EQ(status.stop, 102);
  EXPECT_EQ(status.hardStop, 103);
  EXPECT_EQ(status.lastError, 30);
  EXPECT_GT(status.totalDiskMB, 0);
  EXPECT_LE(status.availableDiskMB, status.totalDiskMB);
}

TEST_F(Stop, StatusWithoutASessionReturnsTwo) {
  EXPECT_EQ(LXAgentRecordGetStatus(nullptr, nullptr), 2);
  EXPECT_TRUE(log_.contains(kLogError, "Invalid Arguments in function LXAgentRecordGetStatus"));
  EXPECT_EQ(LXAgentRecordGetStatus(session_, nullptr), 0);
}

}  // namespace
}  // namespace lmx
