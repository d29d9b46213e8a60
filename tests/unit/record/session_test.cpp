// The session: its initial state, its copies and its cleanup.
#include "capture/api/capture_framework.h"
#include "record/agent_record.h"
#include "record/create_preview.h"
#include "record/prepare_capture.h"
#include "record/preview_controller.h"
#include "record/stop_capture.h"
#include "tests/unit/record/engine_fixture.h"

namespace lmx {
namespace {

using testing::ScriptedCaptureController;

class Session : public EngineTest {};

TEST_F(Session, FreshRecordHasNoStatusErrorOrTimes) {
  const AgentRecord fresh;
  EXPECT_EQ(fresh.status.get(), 0);
  EXPECT_EQ(fresh.error.get(), 0);
  for (const auto* time :
       {&fresh.elapsedTime, &fresh.launchTime, &fresh.startTime, &fresh.stopTime, &fresh.lastContact,
        &fresh.stop_times.hardStopTime, &fresh.stop_times.softStopTime}) {
    EXPECT_FALSE(time->get().has_value());
  }
  EXPECT_FALSE(fresh.filename.get());
  EXPECT_EQ(fresh.captureController.get(), nullptr);
}

TEST_F(Session, CopyHasTheValuesAndSharesTheCapture) {
  const auto controller = std::make_shared<ScriptedCaptureController>(journal_);
  session_->captureController.set(controller);
  session_->filename.set("/r/A.mov");
  session_->request.set({.uuid = "Q"});
  session_->recording_uuid.set("U");
  session_->status.set(2);
  session_->startTime.set(TimeValue{5, 6});
  session_->autoShutoffCheckTimer.set(true);
  const auto copy = session_->copy();
  EXPECT_EQ(copy->captureController.get(), controller);
  EXPECT_EQ(copy->filename.get(), "/r/A.mov");
  EXPECT_EQ(copy->request.get().uuid, "Q");
  EXPECT_EQ(copy->recording_uuid.get(), "U");
  EXPECT_EQ(copy->status.get(), 2);
  EXPECT_EQ(copy->recordingType.get(), kRecordingTypeAudioVideo);
  EXPECT_EQ(copy->startTime.get()->tv_sec, 5);
  EXPECT_FALSE(copy->stopTime.get().has_value());
  EXPECT_FALSE(copy->autoShutoffCheckTimer.get());
  copy->captureController.get()->stopRecording();
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
}

TEST_F(Session, CopyHasEverySetting) {
  session_->error.set(30);
  session_->stop_times.maxUnattendedRecordingMinutes.set(2);
  session_->videoWidth.set(6);
  session_->videoHeight.set(7);
  session_->audioOnlyMode.set(true);
  session_->diskSpaceCutoffInMB.set(10);
  session_->metadata.set(parameters({{"a", "b"}}));
  const auto copy = session_->copy();
  EXPECT_EQ(copy->error.get(), 30);
  EXPECT_EQ(copy->stop_times.maxUnattendedRecordingMinutes.get(), 2);
  EXPECT_EQ(copy->videoWidth.get(), 6U);
  EXPECT_EQ(copy->videoHeight.get(), 7U);
  EXPECT_TRUE(copy->audioOnlyMode.get());
  EXPECT_EQ(copy->diskSpaceCutoffInMB.get(), 10U);
  EXPECT_EQ(lookUp(copy->metadata.get(), "a"), "b");
}

TEST_F(Session, CopyHasEachTimeThatIsSetAndNoOther) {
  const auto times = [](AgentRecord& record) {
    return std::array{&record.elapsedTime,
                      &record.launchTime,
                      &record.startTime,
                      &record.stopTime,
                      &record.lastContact,
                      &record.stop_times.hardStopTime,
                      &record.stop_times.softStopTime};
  };
  const auto own = times(*session_);
  for (std::size_t set = 0; set < own.size(); ++set) {
    own[set]->set(TimeValue{5, 6});
    const auto copy = session_->copy();
    const auto copied = times(*copy);
    for (std::size_t i = 0; i < copied.size(); ++i) EXPECT_EQ(copied[i]->get().has_value(), i == set);
    ASSERT_TRUE(copied[set]->get());
    EXPECT_EQ(copied[set]->get()->tv_sec, 5);
    EXPECT_EQ(copied[set]->get()->tv_usec, 6);
    own[set]->set(std::nullopt);
  }
}

TEST_F(Session, CopySharesTheCaptureObjects) {
  ASSERT_EQ(LXAgentRecordPrepareCapture(*context_, parameters({})), 0);
  session_->previewController.set(
      LXAgentRecordCreatePreviewController("camera", std::nullopt, false, 400, nullptr));
  const auto copy = session_->copy();
  EXPECT_NE(copy->captureThread.get(), nullptr);
  EXPECT_EQ(copy->captureThread.get(), session_->captureThread.get());
  EXPECT_NE(copy->previewController.get(), nullptr);
  EXPECT_EQ(copy->previewController.get(), session_->previewController.get());
  EXPECT_NE(copy->captureControllerDelegate.get(), nullptr);
  EXPECT_EQ(copy->captureControllerDelegate.get(), session_->captureControllerDelegate.get());
}

TEST_F(Session, StoppingThroughACopyStopsTheSameRecording) {
  ASSERT_EQ(LXAgentRecordPrepareCapture(*context_, parameters({})), 0);
  const auto copy = session_->copy();
  actions_.on_stop_capture = [&] {
    copy->status.set(kRecorderIdle);
    endCaptures();
  };
  EXPECT_EQ(LXAgentRecordStopCapture(copy), 0);
  const auto marks = framework_->controller(0)->marks();
  ASSERT_EQ(marks.size(), 2U);
  EXPECT_EQ(marks[1].operation, "setStop");
  EXPECT_EQ(marks[1].uuid, session_->recording_uuid.get());
  EXPECT_EQ(journalCount("stopCapture"), 1);
}

TEST_F(Session, CopyKeepsItsValuesWhenTheSessionMovesOn) {
  session_->filename.set("/r/A.mov");
  session_->stopTime.set(TimeValue{1, 0});
  const auto copy = session_->copy();
  session_->filename.set("/r/B.mov");
  session_->stopTime.set(TimeValue{2, 0});
  EXPECT_EQ(copy->filename.get(), "/r/A.mov");
  EXPECT_EQ(copy->stopTime.get()->tv_sec, 1);
}

TEST_F(Session, CopyHasAMutexOfItsOwn) {
  ASSERT_EQ(session_->lockStatusAndTimingMutex(), 0);
  const auto copy = session_->copy();
  std::thread([&] {
    EXPECT_EQ(copy->lockStatusAndTimingMutex(), 0);
    EXPECT_EQ(copy->unlockStatusAndTimingMutex(), 0);
  }).join();
  EXPECT_EQ(session_->unlockStatusAndTimingMutex(), 0);
}

TEST_F(Session, CleanupWhileRecordingStopsAndReports) {
  const auto record = std::make_shared<AgentRecord>();
  const auto controller = std::make_shared<ScriptedCaptureController>(journal_);
  controller->shut_down = true;
  controller->elapsed_of_request = 7.9;
  record->recordingType.set(kRecordingTypeAudio);
  record->captureController.set(controller);
  record->filename.set("/r/A.mov");
  record->status.set(kRecorderRecording);
  actions_.on_stop_capture = [&] { record->status.set(kRecorderIdle); };
  record->cleanup();
  EXPECT_EQ(journal_.entries(), (Entries{"setStop", "stopCapture", "recordDidStop /r/A.mov 7"}));
  EXPECT_EQ(record->captureController.get(), nullptr);
  EXPECT_FALSE(record->filename.get());
}

TEST_F(Session, CleanupOfACopyStopsNothing) {
  const auto record = std::make_shared<AgentRecord>();
  record->recordingType.set(kRecordingTypeAudio);
  record->status.set(kRecorderRecording);
  record->copy()->cleanup();
  EXPECT_TRUE(journal_.entries().empty());
  record->status.set(kRecorderIdle);
}

TEST_F(Session, CleanupKeepsTheRequest) {
  session_->request.set({.uuid = "Q"});
  session_->cleanup();
  EXPECT_EQ(session_->request.get().uuid, "Q");
  EXPECT_EQ(session_->recording_uuid.get(), "");
}

}  // namespace
}  // namespace lmx
