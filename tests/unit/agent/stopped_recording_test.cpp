// How a stopped recording becomes a job: movie, document, queue.
#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "model/metadata_keys.h"
#include "postprocess/properties_document.h"
#include "postprocess/property_gatherer.h"
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

using testing::readFile;

class StoppedRecording : public AgentTest {
 protected:
  /// Stops the capture, makes it report, and runs the loop for the hand-over.
  void stopAndReport(const Controller& controller) {
    agent_.stopRecording();
    reportEnd(controller);
    turnTheLoop();
  }
};

TEST_F(StoppedRecording, BecomesAMovieADocumentAndAJob) {
  const auto controller = start("R1", {{"RecordingMetadata_TITLE", "Talk"}});
  controller->elapsed_of_request = 61.9;
  stopAndReport(controller);
  const auto job = nextJob();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(job->recording_file_path, movie("R1.mov"));
  EXPECT_EQ(job->properties_file_path, movie("R1.xml"));
  EXPECT_FALSE(job->canceled);
  EXPECT_EQ(getProperty(job->properties, "RecordingMetadata_RECORDING_UUID"), "R1");
  EXPECT_EQ(getProperty(job->properties, "RecordingMetadata_TITLE"), "Talk");
  EXPECT_EQ(getProperty(job->properties, "RecordingMetadata_DURATION"), "61");
  EXPECT_EQ(getProperty(job->properties, "RecordingMetadata_TYPE"), "Audio+Video");
  EXPECT_EQ(readFile(movie("R1.mov")), "movie");
  EXPECT_EQ(readFile(movie("R1.xml")), propertiesXml(job->properties));
  EXPECT_EQ(journalCount("processRequest request of R1 " + movie("R1.mov")), 1);
  EXPECT_TRUE(log_.contains(kLogNotice, "\"" + movie("R1.mov") + "\" recording stopped (duration: 61s)"));
  EXPECT_TRUE(testing::waitUntil([&] { return journalCount("requestHandedOver request of R1") == 1; }));
}

TEST_F(StoppedRecording, EndDateIsNowLessTheTimeShift) {
  context_->state.timeshift_seconds.set(1000);
  stopAndReport(start("R1"));
  const auto job = nextJob();
  ASSERT_NE(job, nullptr);
  EXPECT_NEAR(std::stod(getProperty(job->properties, "RecordingMetadata_END_DATE").value()),
              static_cast<double>(std::time(nullptr) - 1000), 2.0);
}

TEST_F(StoppedRecording, GoesToTheChosenFile) {
  const auto controller = start("R1", {{"RecordingMetadata_ADHOC_FILE_PATH", movie("chosen.mov")}});
  stopAndReport(controller);
  const auto job = nextJob();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(job->recording_file_path, movie("chosen.mov"));
  EXPECT_EQ(journalCount("processRequestBeside request of R1 " + movie("chosen.mov")), 1)
      << "what is there stays";
}

TEST_F(StoppedRecording, CarriesItsWorkflow) {
  stopAndReport(start("R1", {{"RecordingMetadata_ADHOC_WORKFLOW_UUID", "W"}}));
  const auto job = nextJob();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(job->adhoc_workflow_uuid, "W");
}

TEST_F(StoppedRecording, OnlyTheValueOneDisablesItsSubmission) {
  const auto jobsFor = [&](Dictionary parameters) {
    setParameters(std::move(parameters));
    agent_.recordDidStopWithFile(session_, "/nowhere/r/A.mov", nullptr, std::nullopt, 5, std::nullopt, false);
    std::size_t jobs = 0;
    while (context_->post_process_list.postProcessListNext()) ++jobs;
    return jobs;
  };
  constexpr const char* kKey = "RecordingMetadata_ADHOC_SUBMIT_DISABLED";
  EXPECT_EQ(jobsFor({{kKey, "1"}}), 0U);
  for (const char* value : {"0", "", "true", "11"}) EXPECT_EQ(jobsFor({{kKey, value}}), 1U) << value;
  EXPECT_EQ(jobsFor({}), 1U);
  context_->options.submit_disabled.set(true);
  EXPECT_EQ(jobsFor({}), 0U);
  context_->options.submit_disabled.set(false);
  context_->options.adhoc.set(true);
  EXPECT_EQ(jobsFor({}), 0U);
  context_->options.adhoc.set(false);
}

TEST_F(StoppedRecording, IsLeftToTheNextStartWhenTheAgentHasStopped) {
  const auto controller = start("R1");
  agent_.stopRecording();
  context_->state.running.set(false);
  reportEnd(controller);
  turnTheLoop();
  session_->captureController.set(nullptr);
  EXPECT_TRUE(testing::waitUntil([&] {
    turnTheLoop();
    return controller.use_count() == 1;
  }));
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
  EXPECT_EQ(journalCount("processRequest request of R1 " + movie("R1.mov")), 0);
}

TEST_F(StoppedRecording, AMovieThatCannotBeWrittenIsARuntimeErrorAndNoJob) {
  const auto controller = start("R1");
  controller->on_process_request = [](const std::string&) {
    return std::optional(CaptureError{CaptureError::kDomain, kNoSpace, "disk full"});
  };
  stopAndReport(controller);
  EXPECT_TRUE(log_.waitFor(kLogCritical, "The recording could not be finished: disk full"));
  EXPECT_TRUE(log_.waitFor(kLogError, "An error occurred during recording (8)"));
  EXPECT_TRUE(testing::waitUntil([&] { return session_->error.get() == kRecordCannotWrite; }));
  session_->captureController.set(nullptr);
  EXPECT_TRUE(testing::waitUntil([&] {
    turnTheLoop();
    return controller.use_count() == 1;
  })) << "the hand-off has ended";
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
  EXPECT_EQ(journalCount("requestHandedOver request of R1"), 0);
}

/// The second START comes before the first capture has reported.
TEST_F(StoppedRecording, ASecondRecordingKeepsItsOwnMovieParametersAndType) {
  const auto first = start("R1", {{"RecordingMetadata_TITLE", "First"}});
  agent_.stopRecording();
  const auto second =
      start("R2", {{"RecordingMetadata_TITLE", "Second"}, {"RecordingMetadata_AUDIO_ONLY", "true"}});
  ASSERT_NE(first, second);
  reportEnd(first);
  turnTheLoop();
  const auto job1 = nextJob();
  ASSERT_NE(job1, nullptr);
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudio);  // the report was for the first one
  EXPECT_TRUE(session_->audioOnlyMode.get());
  stopAndReport(second);
  const auto job2 = nextJob();
  ASSERT_NE(job2, nullptr);
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudioVideo);

  EXPECT_EQ(job1->recording_file_path, movie("R1.mov"));
  EXPECT_EQ(getProperty(job1->properties, "RecordingMetadata_RECORDING_UUID"), "R1");
  EXPECT_EQ(getProperty(job1->properties, "RecordingMetadata_TITLE"), "First");
  EXPECT_EQ(getProperty(job1->properties, "RecordingMetadata_TYPE"), "Audio+Video");
  EXPECT_EQ(job2->recording_file_path, movie("R2.mov"));
  EXPECT_EQ(getProperty(job2->properties, "RecordingMetadata_RECORDING_UUID"), "R2");
  EXPECT_EQ(getProperty(job2->properties, "RecordingMetadata_TITLE"), "Second");
  EXPECT_EQ(getProperty(job2->properties, "RecordingMetadata_TYPE"), "Audio");
}

TEST_F(StoppedRecording, AHandOverDoesNotMakeALaterRecordingIdle) {
  const auto first = start("R1");
  agent_.stopRecording();
  start("R2");
  reportEnd(first);
  turnTheLoop();
  EXPECT_TRUE(testing::waitUntil([&] { return journalCount("requestHandedOver request of R1") == 1; }));
  EXPECT_NE(nextJob(), nullptr);  // the job holds the capture, too
  EXPECT_TRUE(testing::waitUntil([&] {
    turnTheLoop();
    return first.use_count() == 1;
  }));
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
}

TEST_F(StoppedRecording, ALateCancellationDoesNotMakeALaterRecordingIdle) {
  const auto first = start("R1");
  agent_.cancelCapture();
  start("R2");
  first->shut_down = true;
  agent_.captureDidCancel(first.get());
  turnTheLoop();
  EXPECT_TRUE(testing::waitUntil([&] {
    turnTheLoop();
    return first.use_count() == 1;
  }));
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
}

TEST_F(StoppedRecording, CancellingMakesTheSessionIdleAndNoJob) {
  const auto controller = start("R1");
  agent_.cancelCapture();
  session_->status.set(kRecorderRecording);
  controller->shut_down = true;
  controller->delegate()->lmrCaptureDidCancel(std::nullopt);
  turnTheLoop();
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
}

TEST_F(StoppedRecording, ARecordingCutShortByALostDeviceIsHandedOver) {
  const auto controller = start("R1");
  reportEnd(controller, CaptureError{CaptureError::kDomain, kDeviceRemoved, "gone"});
  EXPECT_FALSE(agent_.devices().deviceDisconnected()) << "the recording is on its way";
  turnTheLoop();
  EXPECT_NE(nextJob(), nullptr);
}

TEST_F(StoppedRecording, AFileRecordingMakesItsJobWithoutACapture) {
  session_->recordingType.set(kRecordingTypeFile);
  context_->recording.input_file.set(movie("in.mov"));
  setParameters({{"RecordingMetadata_RECORDING_UUID", "R1"}});
  agent_.prepareCapture();
  ASSERT_EQ(context_->state.status.get(), 0);
  EXPECT_TRUE(testing::waitUntil([&] { return session_->startTime.get().has_value(); }));
  agent_.stopRecording();
  const auto job = context_->post_process_list.postProcessListNext();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(job->recording_file_path, movie("in.mov"));
  EXPECT_EQ(getProperty(job->properties, "RecordingMetadata_TYPE"), "File");
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
}

TEST_F(StoppedRecording, ACancelledFileRecordingMakesNoJob) {
  session_->recordingType.set(kRecordingTypeFile);
  context_->recording.input_file.set(movie("in.mov"));
  setParameters({{"RecordingMetadata_RECORDING_UUID", "R1"}});
  agent_.prepareCapture();
  EXPECT_TRUE(testing::waitUntil([&] { return session_->startTime.get().has_value(); }));
  agent_.cancelCapture();
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
  agent_.stopRecording();
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
  EXPECT_FALSE(log_.mentions("recording stopped"));
}

TEST_F(StoppedRecording, ASecondStopMakesNoSecondJob) {
  const auto controller = start("R1");
  agent_.stopRecording();
  agent_.stopRecording();
  reportEnd(controller);
  turnTheLoop();
  EXPECT_NE(nextJob(), nullptr);
  agent_.stopRecording();
  turnTheLoop();
  EXPECT_TRUE(testing::waitUntil([&] { return journalCount("requestHandedOver request of R1") == 1; }));
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
  EXPECT_EQ(journalCount("processRequest request of R1 " + movie("R1.mov")), 1);
}

TEST_F(StoppedRecording, NewPreferencesDuringItDoNotChangeItsType) {
  const auto controller = start("R1");
  session_->recordingType.set(kRecordingTypeFile);
  stopAndReport(controller);
  const auto job = nextJob();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(journalCount("controller stopRecording"), 1);
  EXPECT_EQ(getProperty(job->properties, "RecordingMetadata_TYPE"), "Audio+Video");
}

TEST_F(StoppedRecording, AFileRecordingSurvivesARefusedAudioOnlyRequest) {
  testing::writeFile(movie("in.mov"), "movie");
  context_->recording.input_file.set(movie("in.mov"));
  context_->recording.recording_type.set("File");
  session_->recordingType.set(kRecordingTypeFile);
  setParameters({{"RecordingMetadata_RECORDING_UUID", "F1"}});
  agent_.prepareCapture();
  ASSERT_EQ(context_->state.status.get(), 0);
  const auto begun = session_->launchTime.get();
  setParameters({{"RecordingMetadata_RECORDING_UUID", "F2"}, {"RecordingMetadata_AUDIO_ONLY", "true"}});
  agent_.prepareCapture();
  EXPECT_EQ(context_->state.status.get(), 4);
  agent_.stopRecording();
  const auto job = context_->post_process_list.postProcessListNext();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(getProperty(job->properties, "RecordingMetadata_TYPE"), "File");
  EXPECT_GE(std::stol(getProperty(job->properties, "RecordingMetadata_START_DATE").value()), begun->tv_sec);
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeFile);
}

TEST_F(StoppedRecording, ThatEndedByItselfIsSubmittedBeforeItsReport) {
  const auto first = start("R1");
  first->shut_down = true;  // the disk is full, for example, and the files are being closed
  agent_.stopRecording();
  const auto second = start("R2");
  reportEnd(first);
  turnTheLoop();
  const auto job = nextJob();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(getProperty(job->properties, "RecordingMetadata_RECORDING_UUID"), "R1");
  stopAndReport(second);
  EXPECT_EQ(getProperty(nextJob()->properties, "RecordingMetadata_RECORDING_UUID"), "R2");
}

TEST_F(StoppedRecording, ThatEndedForLackOfSpaceLeavesItsError) {
  const auto controller = start("R1");
  controller->error = CaptureError{CaptureError::kDomain, kWriteFailed, "no space"};
  stopAndReport(controller);
  ASSERT_NE(nextJob(), nullptr) << "what was written is submitted";
  EXPECT_TRUE(testing::waitUntil([&] { return session_->error.get() == kRecordCannotWrite; }));
  EXPECT_TRUE(log_.contains(kLogError, "The capture of \"" + movie("R1.mov") + "\" ended early: no space"));
}

TEST_F(StoppedRecording, OfALostDeviceLeavesNoDiskError) {
  const auto controller = start("R1");
  controller->error = CaptureError{CaptureError::kDomain, kDeviceNotFound, "gone"};
  stopAndReport(controller);
  ASSERT_NE(nextJob(), nullptr);
  EXPECT_EQ(session_->error.get(), kRecordSuccess);
}

/// The process was killed after it had stored the job and before the capture knew of that.

/// A START before it had named who submits.

TEST_F(StoppedRecording, ThatCouldNotBeDocumentedNorMarkedWaitsForTheNextStart) {
  const auto controller = start("R1");
  controller->journal_can_be_written = false;
  std::filesystem::create_directory(movie("R1.xml"));  // the document can't be written
  stopAndReport(controller);
  EXPECT_TRUE(log_.waitForPart("is submitted by the next start"));
  EXPECT_TRUE(testing::waitUntil([&] { return agent_.submission().isIdle(); }));
  EXPECT_TRUE(std::filesystem::is_empty(systemPath(kJobsDirectory)));
}

TEST_F(StoppedRecording, TheCaptureForgetsItBeforeItsJobCanBegin) {
  const auto controller = start("R1");
  stopAndReport(controller);
  const auto job = nextJob();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(journalCount("requestHandedOver request of R1"), 1);
  EXPECT_NE(job->stored, nullptr) << "a restart takes it up";
  EXPECT_EQ(job->recorded->captureController.get(), nullptr) << "it keeps no file of the capture open";
}

TEST_F(StoppedRecording, AnAgentThatEndsMarksOnlyWhatWasStopped) {
  const auto controller = start("R1");
  agent_.stopCapture();  // as SIGTERM does
  context_->state.running.set(false);
  reportEnd(controller);
  turnTheLoop();
  EXPECT_EQ(journalCount("submitRequest"), 0);
}

TEST_F(StoppedRecording, ThatEndedByItselfIsToBeSubmitted) {
  reportEnd(start("R1"));
  turnTheLoop();
  EXPECT_EQ(journalCount("submitRequest"), 1);
  EXPECT_NE(nextJob(), nullptr);
}

/// The first one is long and takes its time.

TEST_F(StoppedRecording, TheyAreQueuedInTheOrderOfTheirStops) {
  const auto first = start("R1");
  agent_.stopRecording();
  const auto second = start("R2");
  stopAndReport(second);
  EXPECT_TRUE(testing::waitUntil([&] { return journalCount("requestHandedOver request of R2") == 1; }));
  EXPECT_EQ(context_->post_process_list.postProcessListCount(), 0U);
  EXPECT_FALSE(agent_.submission().isIdle());
  reportEnd(first);
  turnTheLoop();
  EXPECT_EQ(nextJob()->recording_file_path, movie("R1.mov"));
  EXPECT_EQ(nextJob()->recording_file_path, movie("R2.mov"));
}

TEST_F(StoppedRecording, AStopOfACaptureThatNeverBeganHoldsNobodyUp) {
  framework_->on_new_controller = [](auto& controller) { controller.prepare_succeeds = false; };
  setParameters({{"RecordingMetadata_RECORDING_UUID", "R1"}});
  agent_.prepareCapture();
  ASSERT_EQ(context_->state.status.get(), 3);
  agent_.stopRecording();
  EXPECT_TRUE(agent_.submission().isIdle());
}

}  // namespace
}  // namespace lmx
