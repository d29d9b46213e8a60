// Preparing a recording: the movie's path, the type, the results and their log lines.
#include <gmock/gmock.h>

#include "record/capture_delegate.h"
#include "tests/unit/record/engine_fixture.h"

namespace lmx {
namespace {

class Prepare : public EngineTest {};

constexpr const char* kReceivedError = "_LXAgentRecordPrepareCaptureSync received error";

TEST_F(Prepare, StartsTheCaptureUnderTheNameOfTheRecording) {
  session_->setError(30);
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(session_->filename(), movie("R1.mov"));
  EXPECT_EQ(session_->status(), kRecorderRecording);
  EXPECT_EQ(session_->error(), 0);
  EXPECT_TRUE(session_->launchTime());
  EXPECT_EQ(session_->elapsedTime()->tv_sec, 0);
  EXPECT_EQ(lookUp(session_->metadata(), "RecordingMetadata_RECORDING_UUID"), "R1");
  EXPECT_EQ(journalCount("recordDidStart " + movie("R1.mov")), 1);
  const auto controller = framework_->controller(0);
  ASSERT_NE(controller, nullptr);
  EXPECT_EQ(controller->delegate(),
            std::static_pointer_cast<CaptureControllerDelegate>(session_->captureControllerDelegate()));
  EXPECT_EQ(controller->settings()->outputPath, movie("R1.mov"));
  ASSERT_EQ(controller->marks().size(), 1U);
  EXPECT_EQ(controller->marks()[0].uuid, session_->recording_uuid());
  EXPECT_TRUE(testing::waitUntil([&] { return session_->startTime().has_value(); }));
}

TEST_F(Prepare, EachOneMakesAFreshUuid) {
  ASSERT_EQ(prepare(), 0);
  const std::string first = session_->recording_uuid();
  endCaptures();
  session_->setStatus(kRecorderIdle);
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(first.size(), 36U);
  EXPECT_NE(session_->recording_uuid(), first);
}

TEST_F(Prepare, WithoutUuidTheMovieIsCalledTest) {
  ASSERT_EQ(prepare({}), 0);
  EXPECT_EQ(session_->filename(), movie("test.mov"));
}

TEST_F(Prepare, AudioOnlyIsTrueInLowerCaseOnly) {
  for (const char* value : {"TRUE", "True", "1", "yes", "true ", ""}) {
    session_->setRecordingType(kRecordingTypeAudioVideo);
    ASSERT_EQ(prepare({{"RecordingMetadata_AUDIO_ONLY", value}}), 0) << value;
    EXPECT_FALSE(session_->audioOnlyMode()) << value;
    EXPECT_EQ(session_->recordingType(), kRecordingTypeAudioVideo) << value;
    endCaptures();
    session_->setStatus(kRecorderIdle);
  }
  ASSERT_EQ(prepare({{"RecordingMetadata_AUDIO_ONLY", "true"}}), 0);
  EXPECT_TRUE(session_->audioOnlyMode());
  EXPECT_EQ(session_->recordingType(), kRecordingTypeAudio);
}

TEST_F(Prepare, TheTypeDecidesWhatIsCaptured) {
  const std::pair<int, CaptureType> rows[] = {
      {1, CaptureType::audio}, {2, CaptureType::audioAndVideo}, {3, CaptureType::video}};
  for (const auto& [type, kind] : rows) {
    session_->setRecordingType(type);
    ASSERT_EQ(prepare(), 0);
    EXPECT_EQ(framework_->controller(framework_->controllersMade() - 1)->settings()->captureType, kind);
    endCaptures();
    session_->setStatus(kRecorderIdle);
  }
}

TEST_F(Prepare, UnattendedMinutesAreReadAsAtoiDoes) {
  ASSERT_EQ(prepare({{"RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "12min"}}), 0);
  EXPECT_EQ(session_->maxUnattendedRecordingMinutes(), 12);
}

TEST_F(Prepare, DurationOfTheContextIsTheLongestRecording) {
  context_->setDuration(77);
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(framework_->controller(0)->settings()->maxDurationMinutes, 77U);
}

TEST_F(Prepare, ADurationBelowOneIsNoLimit) {
  for (const int duration : {0, -5}) {
    context_->setDuration(duration);
    ASSERT_EQ(prepare(), 0);
    EXPECT_EQ(framework_->controller(framework_->controllersMade() - 1)->settings()->maxDurationMinutes, 0U);
    endCaptures();
    session_->setStatus(kRecorderIdle);
  }
}

TEST_F(Prepare, ASegmentLengthGoesBeforeTheDuration) {
  PlistDictionary preferences = testing::capturePreferences(repository_.path());
  // What counts is the length alone, cut to 32 bits, not whether continuous recording is on.
  preferences["ContinuousRecording"] =
      PlistDictionary{{"Enabled", false}, {"RecordingSegmentLength", std::int64_t{0x100000005}}};
  testing::writePreferences(preferences);
  context_->setDuration(77);
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(framework_->controller(0)->settings()->maxDurationMinutes, 5U);
}

TEST_F(Prepare, TheFrameRateOfThePreferencesIsAskedFor) {
  const std::pair<const char*, double> rows[] = {{"25", 25}, {"29.97", 29.97}, {"0", 30}, {"fast", 30}};
  for (const auto& [text, rate] : rows) {
    context_->setRecording_video_maximum_frame_rate(text);
    ASSERT_EQ(prepare(), 0);
    EXPECT_EQ(framework_->controller(framework_->controllersMade() - 1)->settings()->maximumFrameRate, rate);
    endCaptures();
    session_->setStatus(kRecorderIdle);
  }
}

TEST_F(Prepare, FileRecordingTakesTheInputFileAndNoController) {
  session_->setRecordingType(kRecordingTypeFile);
  context_->setInput_file(movie("in.mov"));
  ASSERT_EQ(prepare({{"RecordingMetadata_AUDIO_ONLY", "true"}}), 0);
  EXPECT_EQ(session_->filename(), movie("in.mov"));
  EXPECT_EQ(session_->recordingType(), kRecordingTypeFile);
  EXPECT_EQ(framework_->controllersMade(), 0U);
  EXPECT_EQ(session_->status(), kRecorderRecording);
  EXPECT_TRUE(testing::waitUntil([&] { return session_->startTime().has_value(); }));
}

TEST_F(Prepare, AdhocTakesTheOutputFile) {
  session_->setRecordingType(kRecordingTypeFile);
  context_->setAdhoc(true);
  context_->setAdhoc_output_file(movie("out.mov"));
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(session_->filename(), movie("out.mov"));
  EXPECT_TRUE(testing::waitUntil([&] { return session_->startTime().has_value(); }));
}

TEST_F(Prepare, IsRefusedWhenTheAgentIsNotRunning) {
  context_->setRunning(false);
  EXPECT_EQ(prepare(), 1);
  EXPECT_TRUE(journal_.entries().empty());
}

TEST_F(Prepare, IsRefusedWithoutARepository) {
  context_->setRecording_repository_path(std::nullopt);
  EXPECT_EQ(prepare(), 1);
  EXPECT_TRUE(log_.contains(2, "Internal error occurred"));
}

TEST_F(Prepare, UnknownTypesAreRefused) {
  for (const int type : {0, 5, -1}) {
    session_->setRecordingType(type);
    session_->setMetadata(parameters({{"a", "b"}}));
    EXPECT_EQ(prepare(), 1);
    EXPECT_EQ(session_->error(), 1);
    EXPECT_EQ(session_->metadata(), nullptr);
    EXPECT_EQ(session_->status(), kRecorderIdle);
  }
  EXPECT_EQ(journalCount("recordRuntimeError 1"), 3);
}

TEST_F(Prepare, NeedsASessionAndAPath) {
  constexpr const char* kLine = "Invalid Arguments in function LXAgentRecordPrepareCapture";
  EXPECT_EQ(LXAgentRecordPrepareCaptureSync(*context_, std::nullopt, nullptr), 2);
  session_->setRecordingType(kRecordingTypeFile);
  EXPECT_EQ(prepare(), 2);  // no input file
  context_->setRecord_context(nullptr);
  EXPECT_EQ(prepare(), 2);
  EXPECT_EQ(log_.count(3, kLine), 3);
}

TEST_F(Prepare, ARefusingFrameworkIsThree) {
  framework_->on_new_controller = [](auto& controller) { controller.prepare_succeeds = false; };
  EXPECT_EQ(prepare(), 3);
  EXPECT_EQ(session_->error(), 3);
  EXPECT_EQ(session_->status(), kRecorderIdle);
  EXPECT_EQ(session_->metadata(), nullptr);
  EXPECT_TRUE(log_.contains(3, kReceivedError));
}

TEST_F(Prepare, PreferencesThatCannotBeUsedAreThree) {
  framework_->audio_device_usable = false;
  EXPECT_EQ(prepare(), 3);
  EXPECT_TRUE(log_.contains(2,
                            "Unable to load the recording context, exception = Unknown device ID: microphone "
                            "for preference: RecordingAudioInput"));
  EXPECT_TRUE(log_.contains(3, kReceivedError));
}

TEST_F(Prepare, WhileRecordingIsFourAndLeavesTheRecordingAlone) {
  ASSERT_EQ(prepare(), 0);
  const std::string before = session_->recording_uuid();
  const auto controller = session_->captureController();
  EXPECT_EQ(prepare({{"RecordingMetadata_RECORDING_UUID", "R2"}}), 4);
  EXPECT_TRUE(log_.contains(3, "Unable to start, capture not idle"));
  EXPECT_EQ(journalCount("recordRuntimeError 4"), 1);
  EXPECT_EQ(session_->filename(), movie("R1.mov"));
  EXPECT_EQ(session_->status(), kRecorderRecording);
  EXPECT_EQ(session_->captureController(), controller);
  EXPECT_NE(session_->recording_uuid(), before);
  EXPECT_EQ(session_->error(), 4);
  EXPECT_EQ(framework_->controllersMade(), 1U);
}

TEST_F(Prepare, TooLittleSpaceIsThirtyAndLeavesTheError) {
  session_->setDiskSpaceCutoffInMB(0xFFFFFFFFU);
  session_->setError(3);
  EXPECT_EQ(prepare(), 30);
  EXPECT_EQ(session_->error(), 3);
  EXPECT_EQ(session_->recording_uuid(), "");
  ASSERT_EQ(log_.entries().size(), 1U);
  EXPECT_EQ(log_.entries()[0].level, 4);
  EXPECT_THAT(log_.entries()[0].text, ::testing::MatchesRegex("[0-9]+ MB is below threshold -1 MB"));
}

TEST_F(Prepare, AVolumeThatCannotBeMeasuredPassesTheThreshold) {
  session_->setDiskSpaceCutoffInMB(0xFFFFFFFFU);
  context_->setRecording_repository_path(movie("missing/folder"));
  EXPECT_EQ(prepare(), 0);
}

TEST_F(Prepare, DeadlinesAreLeftAlone) {
  // One that passes while the camera opens must still end the recording at its first check.
  session_->setHardStopTime(TimeValue{1000, 0});
  ASSERT_EQ(prepare(), 0);
  EXPECT_TRUE(session_->hardStopTime() || log_.contains(5, "Agent recording hit hard stop time"));
}

TEST_F(Prepare, TheRecordedTypeIsThatOfThePreparation) {
  ASSERT_EQ(prepare(), 0);
  session_->setRecordingType(kRecordingTypeFile);  // as new preferences do
  EXPECT_EQ(session_->recordedType(), kRecordingTypeAudioVideo);
  EXPECT_EQ(session_->copy()->recordedType(), kRecordingTypeAudioVideo);
}

TEST_F(Prepare, ARefusedRequestForSoundChangesNoType) {
  context_->setRecording_type("Audio+Video");
  ASSERT_EQ(prepare(), 0);
  session_->setRecordingType(kRecordingTypeAudio);  // as the handler of START does
  EXPECT_EQ(LXAgentRecordPrepareCapture(*context_, std::make_shared<const Dictionary>(
                                                       Dictionary{{"RecordingMetadata_AUDIO_ONLY", "true"}})),
            4);
  EXPECT_EQ(session_->recordedType(), kRecordingTypeAudioVideo);
  EXPECT_EQ(session_->recordingType(), kRecordingTypeAudioVideo);
}

TEST_F(Prepare, LogLinesOfThePrepareStepByResult) {
  EXPECT_EQ(LXAgentRecordPrepareCaptureController(*context_), 0);
  framework_->on_new_controller = [](auto& controller) {
    controller.prepare_succeeds = false;
    controller.error = CaptureError{CaptureError::kDomain, kDeviceBusy, "camera is busy"};
  };
  EXPECT_EQ(LXAgentRecordPrepareCaptureController(*context_), 3);
  EXPECT_TRUE(log_.contains(3, "The capture could not be prepared: camera is busy"));
}

TEST(DiskSpace, UnknownPathGivesAllOnesAndErrno) {
  int error = 0;
  EXPECT_EQ(LXAgentFreeKilobytesAtPath("/no/such/folder", &error), ~std::uint64_t{0});
  EXPECT_EQ(error, ENOENT);
  EXPECT_EQ(LXAgentFreeKilobytesAtPath("/no/such/folder", nullptr), ~std::uint64_t{0});
}

TEST_F(Prepare, DiskSpaceIsThatOfTheMoviesDirectory) {
  EXPECT_EQ(LXAgentRecordHasDiskSpace(0, movie("A.mov")), 1);
  EXPECT_EQ(LXAgentRecordHasDiskSpace(0xFFFFFFFFU, movie("A.mov")), 0);
  EXPECT_EQ(LXAgentRecordHasDiskSpace(0xFFFFFFFFU, "/no/such/folder/A.mov"), 1);
}

TEST_F(Prepare, VolumeIsThatOfTheFileElseTheRepository) {
  EXPECT_EQ(session_->volumePath(), repository_.path());
  session_->setFilename("");
  EXPECT_EQ(session_->volumePath(), repository_.path());
  session_->setFilename("/elsewhere/A.mov");
  EXPECT_EQ(session_->volumePath(), "/elsewhere");
}

TEST_F(Prepare, TotalSpaceIsZeroWhenItCannotBeMeasured) {
  EXPECT_GT(LXAgentRecordTotalDiskMegabytes(session_), 0);
  session_->setFilename("/no/such/folder/A.mov");
  EXPECT_EQ(LXAgentRecordTotalDiskMegabytes(session_), 0);
  EXPECT_TRUE(log_.contains(3, "statfs failed: 2"));
}

}  // namespace
}  // namespace lmx
