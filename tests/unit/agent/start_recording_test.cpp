// What a START does on the main thread: parameters, limits, request, marks; and what a refused one leaves
// alone.
#include <ctime>

#include "model/codes.h"
#include "model/metadata_keys.h"
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

SharedDictionary parameters(const std::string& uuid, Dictionary more = {}) {
  Dictionary all{{"RecordingMetadata_RECORDING_UUID", uuid},
                 {"RecordingMetadata_MAX_RECORDING_MINUTES", "50"},
                 {"RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "20"}};
  all.merge(more);
  return std::make_shared<const Dictionary>(std::move(all));
}

class StartRecording : public AgentTest {
 protected:
  StartRecording() { agent_.mainRunLoop().adoptThread(); }
  void setContinuous() {
    LMRContinuousRecordingInfo info;
    info.enabled = true;
    context_->recording.continuous.set(info);
  }
  [[nodiscard]] Controller lastController() const {
    return framework_->controller(framework_->controllersMade() - 1);
  }
};

TEST_F(StartRecording, PreparesThenMarksItsRequest) {
  const auto given = parameters("R1", {{"RecordingMetadata_TITLE", "Talk"}});
  const double before = secondsSinceReferenceDate();
  EXPECT_EQ(agent_.performStart(given), 0);
  const RecordingRequest request = session_->request.get();
  EXPECT_EQ(request.uuid.size(), 36U);
  EXPECT_EQ(request.properties, given);
  EXPECT_EQ(context_->state.properties.get(), given);
  EXPECT_EQ(session_->stop_times.maxUnattendedRecordingMinutes.get(), 20);
  EXPECT_TRUE(session_->stop_times.hardStopTime.get());
  const auto marks = lastController()->marks();
  ASSERT_EQ(marks.size(), 2U) << "the capture's tag and the request";
  EXPECT_EQ(marks[1].uuid, request.uuid);
  EXPECT_EQ(marks[1].parameters, given);
  EXPECT_GE(marks[1].time.value_or(0), before);
}

TEST_F(StartRecording, MarksTheShiftedTime) {
  context_->state.timeshift_seconds.set(300);
  const double before = secondsSinceReferenceDate() - 300;
  ASSERT_EQ(agent_.performStart(parameters("R1")), 0);
  EXPECT_GE(lastController()->marks()[1].time.value_or(0), before);
  EXPECT_LE(lastController()->marks()[1].time.value_or(0), before + 30);
}

TEST_F(StartRecording, ReturnsItsOwnResult) {
  session_->diskSpaceCutoffInMB.set(0xFFFFFFFFU);
  agent_.stopRecording();  // leaves success in the shared status
  EXPECT_EQ(agent_.performStart(parameters("R1")), kRecordNoDiskSpace);
  EXPECT_EQ(session_->request.get().uuid, "") << "nothing records";
}

TEST_F(StartRecording, AfterTheEndOfTheLoopIsNoRecording) {
  agent_.mainRunLoop().stop();
  EXPECT_EQ(agent_.performStart(parameters("R1")), kRecordInvalidType);
}

TEST_F(StartRecording, WhoSubmitsTravelsWithTheRequest) {
  ASSERT_EQ(agent_.performStart(parameters("R1", {{"RecordingMetadata_AGENT_USERNAME", "bob"},
                                                  {"RecordingMetadata_AGENT_PASSWORD", "sesame"}})),
            0);
  context_->options.user.set("eve");
  EXPECT_EQ(session_->request.get().user, "bob");
  EXPECT_EQ(session_->request.get().password, "sesame");
}

TEST_F(StartRecording, WithEmptyNamesIsSubmittedByWhomTheAgentKnows) {
  context_->options.user.set("bob");
  ASSERT_EQ(agent_.performStart(parameters("R1", {{"RecordingMetadata_AGENT_USERNAME", ""}})), 0);
  EXPECT_EQ(session_->request.get().user, "bob");
}

/// A restart must submit to the workflow as well.
TEST_F(StartRecording, TheJournalLearnsWhoSubmitsToAWorkflow) {
  context_->options.user.set("bob");
  ASSERT_EQ(agent_.performStart(parameters("R1")), 0);
  EXPECT_FALSE(lookUp(lastController()->marks()[1].parameters, metadata_key::kJobUser)) << "nobody needs it";
  lastController()->shut_down = true;
  session_->status.set(kRecorderIdle);
  ASSERT_EQ(agent_.performStart(parameters("R2", {{"RecordingMetadata_ADHOC_WORKFLOW_UUID", "W"}})), 0);
  EXPECT_EQ(lookUp(lastController()->marks()[1].parameters, metadata_key::kJobUser), "bob");
  EXPECT_FALSE(lookUp(session_->request.get().properties, metadata_key::kJobUser)) << "nor does the document";
}

TEST_F(StartRecording, OnlyTheExactTextTrueMakesAudioOnly) {
  for (const char* value : {"TRUE", "yes", "1", "", "true"}) {
    session_->status.set(kRecorderIdle);
    session_->recordingType.set(kRecordingTypeAudioVideo);
    ASSERT_EQ(agent_.performStart(parameters("R1", {{"RecordingMetadata_AUDIO_ONLY", value}})), 0);
    const bool audio = std::string_view(value) == "true";
    EXPECT_EQ(session_->recordingType.get(), audio ? kRecordingTypeAudio : kRecordingTypeAudioVideo) << value;
    EXPECT_EQ(
        log_.contains(kLogDebug, "RecordingMetadata_AUDIO_ONLY: switching to audio-only recording type"),
        audio);
    lastController()->shut_down = true;
  }
}

TEST_F(StartRecording, InContinuousModeOnlyBeginsARequest) {
  const auto running = start("R1");
  setContinuous();
  EXPECT_EQ(agent_.performStart(parameters("R2")), 0);
  EXPECT_EQ(framework_->controllersMade(), 1U);
  EXPECT_EQ(running->marks().back().uuid, session_->request.get().uuid);
  EXPECT_EQ(lookUp(running->marks().back().parameters, "RecordingMetadata_RECORDING_UUID"), "R2");
}

/// A server repeats a START whose reply was lost; another one comes from the local socket.
TEST_F(StartRecording, RefusedWhileARecordingRunsChangesNothing) {
  ASSERT_EQ(agent_.performStart(parameters(
                "R1", {{"RecordingMetadata_TITLE", "First"}, {"RecordingMetadata_AGENT_USERNAME", "bob"}})),
            0);
  const RecordingRequest request = session_->request.get();
  const auto metadata = session_->metadata.get();
  const auto properties = context_->state.properties.get();
  session_->stop_times.hardStopTime.set(TimeValue{4000000000, 1});
  session_->stop_times.softStopTime.set(TimeValue{4000000000, 2});
  const auto marks = lastController()->marks().size();

  EXPECT_EQ(agent_.performStart(parameters("R2", {{"RecordingMetadata_AUDIO_ONLY", "true"},
                                                  {"RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "1"},
                                                  {"RecordingMetadata_AGENT_USERNAME", "eve"}})),
            kRecordNotIdle);
  EXPECT_TRUE(log_.contains(kLogError, "Unable to start, capture not idle"));
  EXPECT_TRUE(log_.contains(kLogError, "An error occurred during recording (4)"));
  EXPECT_EQ(session_->request.get().uuid, request.uuid);
  EXPECT_EQ(session_->request.get().properties, request.properties);
  EXPECT_EQ(session_->metadata.get(), metadata);
  EXPECT_EQ(context_->state.properties.get(), properties);
  EXPECT_EQ(context_->options.user.get(), "bob");
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudioVideo);
  EXPECT_FALSE(session_->audioOnlyMode.get());
  EXPECT_EQ(session_->filename.get(), movie("R1.mov"));
  EXPECT_EQ(session_->stop_times.maxUnattendedRecordingMinutes.get(), 20);
  EXPECT_EQ(session_->stop_times.hardStopTime.get()->tv_usec, 1);
  EXPECT_EQ(session_->stop_times.softStopTime.get()->tv_usec, 2);
  EXPECT_EQ(framework_->controllersMade(), 1U);
  EXPECT_EQ(lastController()->marks().size(), marks);
}

/// A timed STOP and the server's own, and the next lecture in the same second.
TEST_F(StartRecording, IsNotEndedByAStopForTheRecordingBefore) {
  ASSERT_EQ(agent_.performStart(parameters("R1")), 0);
  const std::string first = session_->addressedRequest();
  agent_.stopRecording();
  agent_.performFor(first, &AgentActions::stopRecording, Wait::no);  // came in while R1 ran
  ASSERT_EQ(agent_.performStart(parameters("R2")), 0);
  turnTheLoop();
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
  EXPECT_TRUE(log_.contains(kLogDebug, "A command for an earlier recording came too late"));
  agent_.performFor(session_->addressedRequest(), &AgentActions::stopRecording, Wait::no);
  turnTheLoop();
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
}

TEST_F(StartRecording, IsAddressedWhileItIsPrepared) {
  std::string addressed;
  framework_->on_new_controller = [&](auto&) { addressed = session_->addressedRequest(); };
  ASSERT_EQ(agent_.performStart(parameters("R1")), 0);
  EXPECT_EQ(addressed, session_->request.get().uuid);
  EXPECT_EQ(session_->preparing_request.get(), "");
  framework_->on_new_controller = [](auto& controller) { controller.prepare_succeeds = false; };
  session_->status.set(kRecorderIdle);
  EXPECT_EQ(agent_.performStart(parameters("R2")), kRecordNotRunning);
  EXPECT_EQ(session_->preparing_request.get(), "");
  framework_->controller(0)->shut_down = true;
}

TEST_F(StartRecording, CancelledLeavesNoRequest) {
  ASSERT_EQ(agent_.performStart(parameters("R1")), 0);
  agent_.cancelRecording();
  EXPECT_EQ(lastController()->marks().back().operation, "cancelRequest");
  EXPECT_EQ(lastController()->marks().back().uuid, session_->request.get().uuid);
  EXPECT_EQ(journalCount("cancelRecording"), 1);
}

TEST_F(StartRecording, ForgetsTheDeadlinesOfAnEarlierRecording) {
  const auto inAnHour = std::time(nullptr) + 3600;
  session_->stop_times.softStopTime.set(TimeValue{inAnHour, 0});
  session_->stop_times.hardStopTime.set(TimeValue{inAnHour, 0});
  ASSERT_EQ(agent_.performStart(parameters("R1", {{"RecordingMetadata_TITLE", "x"}})), 0);
  EXPECT_NE(session_->stop_times.hardStopTime.get()->tv_sec, inAnHour);
  EXPECT_FALSE(session_->stop_times.softStopTime.get());
}

}  // namespace
}  // namespace lmx
