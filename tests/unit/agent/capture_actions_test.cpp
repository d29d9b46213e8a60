// Main-thread actions, engine callbacks and loss of the device.
#include <algorithm>
#include <chrono>
#include <csignal>
#include <ctime>

#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "record/capture_delegate.h"
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

class Actions : public AgentTest {
 protected:
  void setContinuous() {
    LMRContinuousRecordingInfo info;
    info.enabled = true;
    context_->recording.continuous.set(info);
  }
};

TEST_F(Actions, PrepareRecordsWithACopyOfTheParameters) {
  start("R1", {{"RecordingMetadata_TITLE", "Talk"}});
  EXPECT_TRUE(log_.contains(kLogDebug, "Process prepareCapture"));
  EXPECT_EQ(session_->filename.get(), movie("R1.mov"));
  EXPECT_EQ(lookUp(session_->metadata.get(), "RecordingMetadata_TITLE"), "Talk");
  EXPECT_NE(session_->metadata.get(), context_->state.properties.get());
  EXPECT_TRUE(log_.contains(kLogNotice, "\"" + movie("R1.mov") + "\" recording started"));
}

TEST_F(Actions, PrepareLeavesItsResultInTheStatus) {
  session_->recordingType.set(7);
  agent_.prepareCapture();
  EXPECT_EQ(context_->state.status.get(), 1);
  EXPECT_TRUE(log_.contains(kLogError, "An error occurred during recording (1)"));
}

TEST_F(Actions, APreparationThatRunsOutOfMemoryIsNoRecording) {
  framework_->on_new_controller = [](auto&) { throw std::bad_alloc(); };
  context_->state.status.set(0);  // as a START does beforehand
  agent_.mainRunLoop().adoptThread();
  EXPECT_TRUE(agent_.perform(&AgentActions::prepareCapture, Wait::untilDone));
  EXPECT_EQ(context_->state.status.get(), kRecordNotRunning);
  framework_->on_new_controller = nullptr;
  start("R1");  // succeeds: no lock was left held
}

TEST_F(Actions, PreviewActionsLogAndSucceedAlsoWithoutACamera) {
  context_->state.status.set(9);
  agent_.startPreview();
  EXPECT_EQ(context_->state.status.get(), 0);
  context_->state.status.set(9);
  agent_.stopPreview();
  EXPECT_EQ(context_->state.status.get(), 0);
  EXPECT_TRUE(log_.contains(kLogDebug, "Process startPreview"));
  EXPECT_TRUE(log_.contains(kLogDebug, "Process stopPreview"));
}

TEST_F(Actions, PauseIsReportedOnlyWhenItChangesSomething) {
  const auto controller = start("R1");
  controller->elapsed_milliseconds = 65999;
  const std::string line = "\"" + movie("R1.mov") + "\" recording paused (current duration: 65s)";
  controller->state = 4;
  agent_.pauseCapture();
  EXPECT_EQ(log_.count(kLogNotice, line), 0);
  controller->state = 3;
  agent_.pauseCapture();
  EXPECT_EQ(log_.count(kLogNotice, line), 1);
  EXPECT_EQ(journalCount("pauseRecording"), 2);
  EXPECT_EQ(log_.count(kLogDebug, "Process pauseCapture"), 2);
}

TEST_F(Actions, ResumeIsReportedOnlyWhenItChangesSomething) {
  const auto controller = start("R1");
  const std::string line = "\"" + movie("R1.mov") + "\" recording resumed";
  agent_.resumeCapture();
  EXPECT_EQ(log_.count(kLogNotice, line), 0);
  controller->state = 4;
  agent_.resumeCapture();
  EXPECT_EQ(log_.count(kLogNotice, line), 1);
  EXPECT_EQ(journalCount("resumeRecording"), 2);
  EXPECT_EQ(log_.count(kLogDebug, "Process resumeCapture"), 2);
}

TEST_F(Actions, PauseAndResumeKeepTheStatus) {
  start("R1");
  context_->state.status.set(9);
  agent_.pauseCapture();
  agent_.resumeCapture();
  EXPECT_EQ(context_->state.status.get(), 9);
}

TEST_F(Actions, StopStopsTheControllerAndMakesIdle) {
  start("R1");
  context_->state.status.set(9);
  agent_.stopCapture();
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  EXPECT_EQ(journalCount("cancelRecording"), 0);
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
  EXPECT_EQ(context_->state.status.get(), 0);
  EXPECT_TRUE(log_.contains(kLogDebug, "Process stopCapture"));
}

TEST_F(Actions, CancelCancelsTheController) {
  start("R1");
  agent_.cancelCapture();
  EXPECT_EQ(journalCount("cancelRecording"), 1);
  EXPECT_EQ(journalCount("controller stopRecording"), 0);
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
  EXPECT_TRUE(log_.contains(kLogDebug, "Process cancelCapture"));
}

TEST_F(Actions, WithoutACaptureTheyDoNothing) {
  agent_.pauseCapture();
  agent_.resumeCapture();
  agent_.stopCapture();
  agent_.cancelCapture();
  EXPECT_EQ(context_->state.status.get(), 0);
  EXPECT_TRUE(journal_.entries().empty());
}

TEST_F(Actions, AdhocCancelNamesTheRequestAndNothingElse) {
  const auto controller = start("R1");
  context_->options.adhoc.set(true);
  agent_.cancelCapture();
  ASSERT_EQ(controller->marks().back().operation, "cancelRequest");
  EXPECT_EQ(controller->marks().back().uuid, session_->recording_uuid.get());
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
  EXPECT_EQ(journalCount("cancelRecording"), 0);
  context_->options.adhoc.set(false);
}

TEST_F(Actions, AdhocStopMarksTheShiftedStopThenStopsTheRecording) {
  const auto controller = start("R1");
  context_->options.adhoc.set(true);
  context_->state.timeshift_seconds.set(20);
  setContinuous();  // submits instead of stopping again
  const double before = secondsSinceReferenceDate();
  agent_.stopCapture();
  const auto marks = controller->marks();
  const auto mark =
      *std::find_if(marks.rbegin(), marks.rend(), [](const auto& one) { return one.operation == "setStop"; });
  EXPECT_EQ(mark.uuid, session_->recording_uuid.get());
  EXPECT_NEAR(*mark.time, before - 20, 1.0);
  EXPECT_TRUE(log_.contains(kLogDebug, "Process stopRecording"));
  context_->options.adhoc.set(false);
  context_->state.running.set(false);
}

TEST_F(Actions, StopRecordingWithoutParametersIsACancelLineAndNothingElse) {
  start("R1");
  for (const auto& parameters : {SharedDictionary(), std::make_shared<const Dictionary>()}) {
    context_->state.properties.set(parameters);
    agent_.stopRecording();
  }
  EXPECT_EQ(log_.count(kLogAlert, "Recording canceled, missing RecordingMetadata_RECORDING_UUID."), 2);
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
  EXPECT_EQ(journalCount("controller stopRecording"), 0);
}

TEST_F(Actions, StopRecordingAcceptsAFilePathInsteadOfAUuid) {
  start("R1");
  setParameters({{"RecordingMetadata_ADHOC_FILE_PATH", movie("chosen.mov")}});
  agent_.stopRecording();
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
}

TEST_F(Actions, StopRecordingOfAContinuousCaptureSubmitsAndGoesOn) {
  start("R1");
  setContinuous();
  agent_.stopRecording();
  EXPECT_TRUE(log_.contains(kLogDebug, "Submitting Stopped Recording"));
  EXPECT_EQ(journalCount("controller stopRecording"), 0);
  EXPECT_NE(nextJob(), nullptr);
}

TEST_F(Actions, ShutDownControlCancelsAndAsksForTheDeviceAgain) {
  start("R1");
  agent_.shutDownControl();
  EXPECT_TRUE(log_.contains(kLogDebug, "Process shutDownControl"));
  EXPECT_EQ(journalCount("cancelRecording"), 1);
  EXPECT_GT(context_->state.last_device_check.get(), 0);
}

/// PAUSE closes the request's span as well as it pauses the capture.
TEST_F(Actions, TheResumeSignalEndsThePauseOfACommandToo) {
  const auto controller = start("R1");
  agent_.signal(SIGUSR2);
  EXPECT_EQ(controller->marks().back().operation, "setStart");
  EXPECT_EQ(controller->marks().back().uuid, "request of R1");
  EXPECT_EQ(lookUp(controller->marks().back().parameters, "RecordingMetadata_RECORDING_UUID"), "R1");
}

TEST_F(Actions, SignalsRunTheirActions) {
  start("R1");
  agent_.signal(SIGPIPE);
  agent_.signal(SIGUSR1);
  agent_.signal(SIGUSR2);
  EXPECT_EQ(journalCount("pauseRecording"), 1);
  EXPECT_EQ(journalCount("resumeRecording"), 1);
  EXPECT_TRUE(context_->state.running.get());
  agent_.signal(SIGTERM);
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  EXPECT_FALSE(context_->state.running.get());
  for (const char* line : {"Got Pause Signal", "Got Resume Signal", "Got Termination Signal (SIGTERM)"}) {
    EXPECT_TRUE(log_.contains(kLogDebug, line)) << line;
  }
}

TEST_F(Actions, AHangUpCancelsTheCaptureAndTheAgentContinues) {
  start("R1");
  const std::int64_t before = std::time(nullptr);
  agent_.signal(SIGHUP);
  EXPECT_TRUE(log_.contains(kLogDebug, "Got Signal (SIGHUP)"));
  EXPECT_EQ(journalCount("cancelRecording"), 1);
  EXPECT_EQ(journalCount("controller stopRecording"), 0);
  EXPECT_GE(context_->state.last_device_check.get(), before);
  EXPECT_TRUE(context_->state.running.get());
}

TEST_F(Actions, AnInterruptStopsTheCaptureOfADaemonOnly) {
  start("R1");
  context_->options.adhoc.set(true);
  agent_.signal(SIGINT);
  EXPECT_EQ(journalCount("setStop"), 0);
  EXPECT_EQ(journalCount("controller stopRecording"), 0);
  EXPECT_FALSE(context_->state.running.get());
  context_->options.adhoc.set(false);
  context_->state.running.set(true);
  agent_.signal(SIGINT);
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  EXPECT_FALSE(context_->state.running.get());
  EXPECT_EQ(log_.count(kLogDebug, "Got Stop Signal (SIGINT)"), 2);
}

TEST_F(Actions, OtherSignalNumbersAreIgnored) {
  start("R1");
  EXPECT_TRUE(testing::waitUntil([&] { return journalCount("startRecording") == 1; }));
  const Entries before = journal_.entries();
  const auto lines = log_.entries().size();
  for (const int number : {0, SIGALRM, SIGCHLD, 99}) agent_.signal(number);
  EXPECT_EQ(journal_.entries(), before);
  EXPECT_EQ(log_.entries().size(), lines);
  EXPECT_TRUE(context_->state.running.get());
}

TEST_F(Actions, ActionsFromAnotherThreadRunInTheLoop) {
  session_->status.set(kRecorderRecording);
  std::atomic<bool> done{false};
  std::thread poster([&] {
    EXPECT_TRUE(agent_.perform(&AgentActions::setRecorderStatusToIdle, Wait::untilDone));
    EXPECT_EQ(session_->status.get(), kRecorderIdle);
    done = true;
  });
  while (!done) agent_.mainRunLoop().run(std::chrono::milliseconds(5));
  poster.join();
}

TEST_F(Actions, CallbacksLogNothingWhenTheAgentIsNotRunning) {
  context_->state.running.set(false);
  agent_.recordDidStartWithFile("/r/A.mov", nullptr, std::nullopt);
  agent_.recordDidPauseWithFile("/r/A.mov", nullptr, 1);
  agent_.recordDidResumeWithFile("/r/A.mov", nullptr);
  agent_.recordRuntimeErrorCallback(4);
  agent_.recordDidStopWithFile(session_, "/r/A.mov", nullptr, std::nullopt, 1, std::nullopt, false);
  EXPECT_TRUE(log_.entries().empty());
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
}

TEST_F(Actions, CallbacksLogTheirLines) {
  agent_.recordDidStartWithFile("/r/A.mov", nullptr, std::nullopt);
  agent_.recordDidPauseWithFile("/r/A.mov", nullptr, 61);
  agent_.recordDidResumeWithFile("/r/A.mov", nullptr);
  agent_.recordRuntimeErrorCallback(4);
  EXPECT_EQ(log_.entries(), (std::vector<testing::LogCapture::Entry>{
                                {kLogNotice, "\"/r/A.mov\" recording started"},
                                {kLogNotice, "\"/r/A.mov\" recording paused (current duration: 61s)"},
                                {kLogNotice, "\"/r/A.mov\" recording resumed"},
                                {kLogError, "An error occurred during recording (4)"}}));
}

/// Takes two seconds, because the behaviour under test includes a pause.
TEST_F(Actions, ALostDeviceWaitsForTheQueue) {
  const auto delegate = std::make_shared<LMRCaptureDelegate>(nullptr);
  delegate->recordError.set(CaptureError{CaptureError::kDomain, kDeviceRemoved, "gone"});
  session_->captureControllerDelegate.set(delegate);
  context_->post_process_list.postProcessListAddJob(std::make_shared<AgentSubmit>());
  context_->post_process_list.postProcessListAddJob(std::make_shared<AgentSubmit>());
  EXPECT_FALSE(agent_.devices().deviceDisconnected());
  context_->post_process_list.postProcessListNext();
  EXPECT_FALSE(agent_.devices().deviceDisconnected());
  EXPECT_TRUE(log_.entries().empty());
  context_->post_process_list.postProcessListNext();
  EXPECT_TRUE(agent_.devices().deviceDisconnected());
  EXPECT_TRUE(log_.entries().empty()) << "asking changes nothing";
  const auto before = std::chrono::steady_clock::now();
  agent_.devices().announceLostDevice();
  EXPECT_GE(std::chrono::steady_clock::now() - before, std::chrono::milliseconds(1900));
  EXPECT_TRUE(log_.contains(kLogCritical, "The capture device has been disconnected."));
}

TEST_F(Actions, APresentDeviceKeepsTheLoopRunning) {
  EXPECT_FALSE(agent_.devices().deviceDisconnected());
  start("R1");
  EXPECT_FALSE(agent_.devices().deviceDisconnected());
}

}  // namespace
}  // namespace lmx
