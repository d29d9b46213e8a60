// Recordings and jobs that an earlier process, or a cancelled capture, has left.
#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "model/metadata_keys.h"
#include "postprocess/property_gatherer.h"
#include "tests/unit/agent/agent_fixture.h"

namespace lmx {
namespace {

using testing::readFile;

class LeftOver : public AgentTest {
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

TEST_F(LeftOver, RecoveredOnesGetTheirDocumentAndAreNotSubmitted) {
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

TEST_F(LeftOver, ARecoveredOneWithoutItsDocumentIsKeptForTheNextStart) {
  bool forgotten = false;
  RecoveredRecording recovered;
  recovered.path = movie("missing-folder/R9.mov");
  recovered.forget = [&] { forgotten = true; };
  framework_->unfinished = {recovered};
  agent_.submission().takeUpUnfinished(framework_);
  EXPECT_TRUE(testing::waitUntil([&] { return agent_.submission().isIdle(); }));
  EXPECT_FALSE(forgotten);
}

}  // namespace
}  // namespace lmx
