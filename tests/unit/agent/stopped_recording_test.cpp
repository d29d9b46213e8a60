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

TEST_F(StoppedRecording, RecoveredOnesGetTheirDocumentAndAreNotSubmitted) {
  bool forgotten = false;
  RecoveredRecording recovered;
  recovered.path = movie("R9.mov");
  recovered.parameters = std::make_shared<const Dictionary>(Dictionary{{"RecordingMetadata_TITLE", "Lost"}});
  recovered.recordingType = kRecordingTypeVideo;
  recovered.startTime = 100 - kReferenceDateOffset;
  recovered.stopTime = 160 - kReferenceDateOffset;
  recovered.duration = 60.5;
  recovered.forget = [&] {
    EXPECT_TRUE(std::filesystem::exists(movie("R9.xml"))) << "forgotten before the document is there";
    forgotten = true;
  };
  framework_->unfinished = {recovered};
  agent_.submission().takeUpUnfinished(framework_);
  EXPECT_TRUE(testing::waitUntil([&] { return agent_.submission().isIdle(); }));
  EXPECT_TRUE(forgotten);
  const std::string xml = readFile(movie("R9.xml"));
  for (const char* part :
       {"value=\"Lost\"", "value=\"100\"", "value=\"160\"", "value=\"60\"", "value=\"Video\""}) {
    EXPECT_NE(xml.find(part), std::string::npos) << part;
  }
  EXPECT_TRUE(log_.contains(
      5, "Recovered unfinished recording \"" + movie("R9.mov") + "\" (duration: 60s); it was not submitted"));
}

TEST_F(StoppedRecording, ARecoveredOneWithoutItsDocumentIsKeptForTheNextStart) {
  bool forgotten = false;
  RecoveredRecording recovered;
  recovered.path = movie("missing-folder/R9.mov");
  recovered.forget = [&] { forgotten = true; };
  framework_->unfinished = {recovered};
  agent_.submission().takeUpUnfinished(framework_);
  EXPECT_TRUE(testing::waitUntil([&] { return agent_.submission().isIdle(); }));
  EXPECT_FALSE(forgotten);
}

// ---- what an earlier process has left

class LeftOver : public StoppedRecording {
 protected:
  RecoveredRecording stopped(const std::string& uuid, double stopTime) {
    RecoveredRecording recording;
    recording.request = "request of " + uuid;
    recording.submit = true;
    recording.path = movie(uuid + ".mov");
    recording.parameters =
        std::make_shared<const Dictionary>(Dictionary{{"RecordingMetadata_RECORDING_UUID", uuid}});
    recording.recordingType = kRecordingTypeAudioVideo;
    recording.stopTime = stopTime;
    recording.forget = [this, uuid] { journal_.add("forget " + uuid); };
    recording.queued = [this, uuid] {
      journal_.add("queued " + uuid);
      return true;
    };
    return recording;
  }
  /// @return the recordings of the jobs in the list, in order
  Entries takeUp() {
    agent_.submission().takeUpUnfinished(framework_);
    testing::waitUntil([&] { return context_->post_process_list.postProcessListCount() >= expected_; });
    Entries names;
    while (const auto job = context_->post_process_list.postProcessListNext()) {
      names.push_back(getProperty(job->properties, "RecordingMetadata_RECORDING_UUID").value_or("?"));
      jobs_.push_back(job);
    }
    return names;
  }
  std::size_t expected_ = 1;
  std::vector<std::shared_ptr<AgentSubmit>> jobs_;
};

TEST_F(LeftOver, StoppedRecordingsGoToTheServerOldestFirst) {
  framework_->unfinished = {stopped("B", 200), stopped("A", 100)};
  expected_ = 2;
  EXPECT_EQ(takeUp(), (Entries{"A", "B"}));
  EXPECT_EQ(journalCount("forget A") + journalCount("forget B"), 2);
  EXPECT_TRUE(
      log_.contains(kLogNotice, "Finished recording \"" + movie("A.mov") +
                                    "\" (duration: 0s), which had been stopped; it goes to the server"));
}

TEST_F(LeftOver, WaitingJobsComeBeforeThem) {
  JobStore earlier(systemPath(kJobsDirectory));
  AgentSubmit waiting;
  waiting.request = "request of W";
  waiting.properties["RecordingMetadata_RECORDING_UUID"] = "W";
  waiting.recording_file_path = movie("W.mov");
  earlier.keep(waiting, 7);
  framework_->unfinished = {stopped("A", 100)};
  expected_ = 2;
  EXPECT_EQ(takeUp(), (Entries{"W", "A"}));
  EXPECT_TRUE(log_.contains(kLogNotice, "\"" + movie("W.mov") + "\" still waits for its submission"));
}

/// The process was killed after it had stored the job and before the capture knew of that.
TEST_F(LeftOver, OneThatHasItsJobAlreadyGetsNoSecond) {
  JobStore earlier(systemPath(kJobsDirectory));
  AgentSubmit waiting;
  waiting.request = "request of A";
  waiting.properties["RecordingMetadata_RECORDING_UUID"] = "A";
  waiting.recording_file_path = movie("A.mov");
  earlier.keep(waiting, 1);
  framework_->unfinished = {stopped("A", 100)};
  EXPECT_EQ(takeUp(), Entries{"A"});
  EXPECT_TRUE(testing::waitUntil([&] { return agent_.submission().isIdle(); }));
  EXPECT_FALSE(log_.mentions("Finished recording") || log_.mentions("Recovered unfinished"));
  EXPECT_FALSE(std::filesystem::exists(movie("A.xml"))) << "the tool may have taken it with the movie";
}

TEST_F(LeftOver, OneWhoseSubmissionIsDisabledGetsItsDocumentOnly) {
  auto disabled = stopped("A", 100);
  disabled.parameters = std::make_shared<const Dictionary>(Dictionary{
      {"RecordingMetadata_RECORDING_UUID", "A"}, {"RecordingMetadata_ADHOC_SUBMIT_DISABLED", "1"}});
  framework_->unfinished = {disabled};
  agent_.submission().takeUpUnfinished(framework_);
  EXPECT_TRUE(testing::waitUntil([&] { return agent_.submission().isIdle(); }));
  EXPECT_TRUE(std::filesystem::exists(movie("A.xml")));
}

TEST_F(LeftOver, OneWithoutItsDocumentIsSubmittedOnceAndKept) {
  auto homeless = stopped("A", 100);
  homeless.path = movie("missing-folder/A.mov");
  framework_->unfinished = {homeless};
  EXPECT_EQ(takeUp(), Entries{"A"});
  EXPECT_EQ(journalCount("queued A"), 1);
  EXPECT_EQ(journalCount("forget A"), 0);
}

TEST_F(LeftOver, OneThatCouldNotBeMarkedWaitsForTheNextStart) {
  auto homeless = stopped("A", 100);
  homeless.path = movie("missing-folder/A.mov");
  homeless.queued = [] { return false; };
  framework_->unfinished = {homeless};
  agent_.submission().takeUpUnfinished(framework_);
  EXPECT_TRUE(testing::waitUntil([&] { return agent_.submission().isIdle(); }));
  EXPECT_TRUE(std::filesystem::is_empty(systemPath(kJobsDirectory))) << "or it would be submitted twice";
}

/// A START before it had named who submits.
TEST_F(LeftOver, IsSubmittedByWhomItsStartHad) {
  auto mine = stopped("A", 100);
  mine.parameters =
      std::make_shared<const Dictionary>(Dictionary{{"RecordingMetadata_RECORDING_UUID", "A"},
                                                    {"RecordingMetadata_AGENT_USERNAME", ""},
                                                    {"RecordingMetadata_ADHOC_WORKFLOW_UUID", "W"},
                                                    {metadata_key::kJobUser, "bob"},
                                                    {metadata_key::kJobPassword, "sesame"}});
  framework_->unfinished = {mine};
  EXPECT_EQ(takeUp(), Entries{"A"});
  EXPECT_EQ(jobs_.at(0)->user, "bob");
  EXPECT_EQ(jobs_.at(0)->password, "sesame");
  EXPECT_FALSE(jobs_.at(0)->properties.contains(metadata_key::kJobUser))
      << "the document holds what START gave";
}

TEST_F(StoppedRecording, ThatCouldNotBeDocumentedNorMarkedWaitsForTheNextStart) {
  const auto controller = start("R1");
  controller->journal_can_be_written = false;
  std::filesystem::create_directory(movie("R1.xml"));  // the document can't be written
  stopAndReport(controller);
  EXPECT_TRUE(log_.waitForPart("is submitted by the next start"));
  EXPECT_TRUE(testing::waitUntil([&] { return agent_.submission().isIdle(); }));
  EXPECT_TRUE(std::filesystem::is_empty(systemPath(kJobsDirectory)));
}

TEST_F(LeftOver, ACancelledCaptureSubmitsWhatHadBeenStopped) {
  const auto controller = start("R1");
  controller->on_recover = [this] { return std::vector{stopped("R1", 100)}; };
  agent_.cancelCapture();
  controller->shut_down = true;
  controller->delegate()->lmrCaptureDidCancel(std::nullopt);
  turnTheLoop();
  const auto job = nextJob();
  ASSERT_NE(job, nullptr);
  EXPECT_EQ(job->recording_file_path, movie("R1.mov"));
  controller->on_recover = nullptr;
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
