// The session: its state when new, its copy and its end.
#include "record/agent_record.h"

#include "record/preview_controller.h"
#include "support/heap_ptr.h"
#include "tests/unit/record/engine_fixture.h"

namespace lmx {
namespace {

using testing::ScriptedCaptureController;

class Session : public EngineTest {};

TEST_F(Session, FreshRecordHasNoStatusErrorOrTimes) {
  const AgentRecord fresh;
  EXPECT_EQ(fresh.status(), 0);
  EXPECT_EQ(fresh.error(), 0);
  for (const auto get :
       {&AgentRecord::elapsedTime, &AgentRecord::launchTime, &AgentRecord::startTime, &AgentRecord::stopTime,
        &AgentRecord::hardStopTime, &AgentRecord::softStopTime, &AgentRecord::lastContact}) {
    EXPECT_FALSE((fresh.*get)().has_value());
  }
  EXPECT_FALSE(fresh.filename());
  EXPECT_EQ(fresh.captureController(), nullptr);
}

TEST_F(Session, CopyHasTheValuesAndSharesTheCapture) {
  const auto controller = std::make_shared<ScriptedCaptureController>(journal_);
  session_->setCaptureController(controller);
  session_->setFilename("/r/A.mov");
  session_->setRequest_uuid("Q");
  session_->setRecording_uuid("U");
  session_->setStatus(2);
  session_->setStartTime(TimeValue{5, 6});
  session_->setAutoShutoffCheckTimer(true);
  const auto copy = session_->copy();
  EXPECT_EQ(copy->captureController(), controller);
  EXPECT_EQ(copy->filename(), "/r/A.mov");
  EXPECT_EQ(copy->request_uuid(), "Q");
  EXPECT_EQ(copy->recording_uuid(), "U");
  EXPECT_EQ(copy->status(), 2);
  EXPECT_EQ(copy->recordingType(), kRecordingTypeAudioVideo);
  EXPECT_EQ(copy->startTime()->tv_sec, 5);
  EXPECT_FALSE(copy->stopTime().has_value());
  EXPECT_FALSE(copy->autoShutoffCheckTimer());
  copy->captureController()->stopRecording();
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
}

TEST_F(Session, CopyHasEverySetting) {
  session_->setError(30);
  session_->setDelay(1);
  session_->setMaxUnattendedRecordingMinutes(2);
  session_->setSessions({.captureWidth = 3, .videoKeyFrameRate = 4});
  session_->setVideoPercent(5);
  session_->setVideoWidth(6);
  session_->setVideoHeight(7);
  session_->setAudioSampleRate(8);
  session_->setAudioChannelsNumber(9);
  session_->setAudioOnlyMode(true);
  session_->setDiskSpaceCutoffInMB(10);
  session_->setMetadata(parameters({{"a", "b"}}));
  const auto copy = session_->copy();
  EXPECT_EQ(copy->error(), 30);
  EXPECT_EQ(copy->delay(), 1);
  EXPECT_EQ(copy->maxUnattendedRecordingMinutes(), 2);
  EXPECT_EQ(copy->sessions().captureWidth, 3);
  EXPECT_EQ(copy->sessions().videoKeyFrameRate, 4U);
  EXPECT_EQ(copy->videoPercent(), 5U);
  EXPECT_EQ(copy->videoWidth(), 6U);
  EXPECT_EQ(copy->videoHeight(), 7U);
  EXPECT_EQ(copy->audioSampleRate(), 8);
  EXPECT_EQ(copy->audioChannelsNumber(), 9);
  EXPECT_TRUE(copy->audioOnlyMode());
  EXPECT_EQ(copy->diskSpaceCutoffInMB(), 10U);
  EXPECT_EQ(lookUp(copy->metadata(), "a"), "b");
}

TEST_F(Session, CopyHasEachTimeThatIsSetAndNoOther) {
  using Time = AgentRecord::Time;
  const std::pair<Time (AgentRecord::*)() const, void (AgentRecord::*)(Time)> kTimes[] = {
      {&AgentRecord::elapsedTime, &AgentRecord::setElapsedTime},
      {&AgentRecord::launchTime, &AgentRecord::setLaunchTime},
      {&AgentRecord::startTime, &AgentRecord::setStartTime},
      {&AgentRecord::stopTime, &AgentRecord::setStopTime},
      {&AgentRecord::hardStopTime, &AgentRecord::setHardStopTime},
      {&AgentRecord::softStopTime, &AgentRecord::setSoftStopTime},
      {&AgentRecord::lastContact, &AgentRecord::setLastContact}};
  for (const auto& [get, set] : kTimes) {
    (session_.get()->*set)(TimeValue{5, 6});
    const auto copy = session_->copy();
    for (const auto& [other, unused] : kTimes) {
      EXPECT_EQ((copy.get()->*other)().has_value(), other == get);
    }
    const Time copied = (copy.get()->*get)();
    ASSERT_TRUE(copied);
    EXPECT_EQ(copied->tv_sec, 5);
    EXPECT_EQ(copied->tv_usec, 6);
    (session_.get()->*set)(std::nullopt);
  }
}

TEST_F(Session, CopySharesTheCaptureObjects) {
  ASSERT_EQ(LXAgentRecordPrepareCapture(*context_, parameters({})), 0);
  session_->setPreviewController(
      LXAgentRecordCreatePreviewController("camera", std::nullopt, false, 400, nullptr));
  const auto copy = session_->copy();
  EXPECT_NE(copy->captureThread(), nullptr);
  EXPECT_EQ(copy->captureThread(), session_->captureThread());
  EXPECT_NE(copy->previewController(), nullptr);
  EXPECT_EQ(copy->previewController(), session_->previewController());
  EXPECT_NE(copy->captureControllerDelegate(), nullptr);
  EXPECT_EQ(copy->captureControllerDelegate(), session_->captureControllerDelegate());
}

TEST_F(Session, StoppingThroughACopyStopsTheSameRecording) {
  ASSERT_EQ(LXAgentRecordPrepareCapture(*context_, parameters({})), 0);
  const auto copy = session_->copy();
  actions_.on_stop_capture = [&] {
    copy->setStatus(kRecorderIdle);
    endCaptures();
  };
  EXPECT_EQ(LXAgentRecordStopCapture(copy), 0);
  const auto marks = framework_->controller(0)->marks();
  ASSERT_EQ(marks.size(), 2U);
  EXPECT_EQ(marks[1].operation, "setStop");
  EXPECT_EQ(marks[1].uuid, session_->recording_uuid());
  EXPECT_EQ(journalCount("stopCapture"), 1);
}

TEST_F(Session, CopyKeepsItsValuesWhenTheSessionGoesOn) {
  session_->setFilename("/r/A.mov");
  session_->setStopTime(TimeValue{1, 0});
  const auto copy = session_->copy();
  session_->setFilename("/r/B.mov");
  session_->setStopTime(TimeValue{2, 0});
  EXPECT_EQ(copy->filename(), "/r/A.mov");
  EXPECT_EQ(copy->stopTime()->tv_sec, 1);
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

TEST_F(Session, CleanupOfARecordingOneStopsItWithItsCallback) {
  const auto record = std::make_shared<AgentRecord>();
  const auto controller = std::make_shared<ScriptedCaptureController>(journal_);
  controller->shut_down = true;
  controller->elapsed_of_request = 7.9;
  record->setRecordingType(kRecordingTypeAudio);
  record->setCaptureController(controller);
  record->setFilename("/r/A.mov");
  record->setStatus(kRecorderRecording);
  actions_.on_stop_capture = [&] { record->setStatus(kRecorderIdle); };
  record->cleanup();
  EXPECT_EQ(journal_.entries(), (Entries{"setStop", "stopCapture", "recordDidStop /r/A.mov 7"}));
  EXPECT_EQ(record->captureController(), nullptr);
  EXPECT_FALSE(record->filename());
}

TEST_F(Session, CleanupOfACopyStopsNothing) {
  const auto record = std::make_shared<AgentRecord>();
  record->setRecordingType(kRecordingTypeAudio);
  record->setStatus(kRecorderRecording);
  record->copy()->cleanup();
  EXPECT_TRUE(journal_.entries().empty());
  record->setStatus(kRecorderIdle);
}

TEST_F(Session, CleanupKeepsTheRequest) {
  session_->setRequest_uuid("Q");
  session_->cleanup();
  EXPECT_EQ(session_->request_uuid(), "Q");
  EXPECT_EQ(session_->recording_uuid(), "");
}

TEST(TimeArithmetic, MicrosecondsAreCarriedAndBorrowed) {
  struct Row {
    TimeValue a, b, sum, difference;
  };
  for (const Row& row : {Row{{5, 600000}, {2, 400000}, {8, 0}, {3, 200000}},
                         Row{{5, 100000}, {2, 400000}, {7, 500000}, {2, 700000}},
                         Row{{1, 999999}, {0, 999999}, {2, 999998}, {1, 0}}}) {
    const heap_ptr<TimeValue> sum(LXAgentTimevalAdd(&row.a, &row.b));
    const heap_ptr<TimeValue> difference(LXAgentTimevalSubtract(&row.a, &row.b));
    EXPECT_EQ(sum->tv_sec, row.sum.tv_sec);
    EXPECT_EQ(sum->tv_usec, row.sum.tv_usec);
    EXPECT_EQ(difference->tv_sec, row.difference.tv_sec);
    EXPECT_EQ(difference->tv_usec, row.difference.tv_usec);
  }
}

}  // namespace
}  // namespace lmx
