// Preparing a recording: the movie's path, the type, the results and their log lines.
#include <gmock/gmock.h>

#include "capture/api/capture_framework.h"
#include "record/capture_delegate.h"
#include "record/capture_set_up.h"
#include "record/disk_space.h"
#include "record/prepare_capture.h"
#include "record/recording_status.h"
#include "tests/unit/record/engine_fixture.h"

namespace lmx {
namespace {

class Prepare : public EngineTest {};

constexpr const char* kReceivedError = "_LXAgentRecordPrepareCaptureSync received error";

TEST_F(Prepare, StartsTheCaptureUnderTheNameOfTheRecording) {
  session_->error.set(30);
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(session_->filename.get(), movie("R1.mov"));
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
  EXPECT_EQ(session_->error.get(), 0);
  EXPECT_TRUE(session_->launchTime.get());
  EXPECT_EQ(session_->elapsedTime.get()->tv_sec, 0);
  EXPECT_EQ(lookUp(session_->metadata.get(), "RecordingMetadata_RECORDING_UUID"), "R1");
  EXPECT_EQ(journalCount("recordDidStart " + movie("R1.mov")), 1);
  const auto controller = framework_->controller(0);
  ASSERT_NE(controller, nullptr);
  EXPECT_EQ(controller->delegate(),
            std::static_pointer_cast<CaptureControllerDelegate>(session_->captureControllerDelegate.get()));
  EXPECT_EQ(controller->settings()->outputPath, movie("R1.mov"));
  ASSERT_EQ(controller->marks().size(), 1U);
  EXPECT_EQ(controller->marks()[0].uuid, session_->recording_uuid.get());
  EXPECT_TRUE(testing::waitUntil([&] { return session_->startTime.get().has_value(); }));
}

TEST_F(Prepare, EachPreparationCreatesANewUuid) {
  ASSERT_EQ(prepare(), 0);
  const std::string first = session_->recording_uuid.get();
  endCaptures();
  session_->status.set(kRecorderIdle);
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(first.size(), 36U);
  EXPECT_NE(session_->recording_uuid.get(), first);
}

TEST_F(Prepare, WithoutUuidTheMovieIsCalledTest) {
  ASSERT_EQ(prepare({}), 0);
  EXPECT_EQ(session_->filename.get(), movie("test.mov"));
}

TEST_F(Prepare, AudioOnlyIsTrueInLowerCaseOnly) {
  for (const char* value : {"TRUE", "True", "1", "yes", "true ", ""}) {
    session_->recordingType.set(kRecordingTypeAudioVideo);
    ASSERT_EQ(prepare({{"RecordingMetadata_AUDIO_ONLY", value}}), 0) << value;
    EXPECT_FALSE(session_->audioOnlyMode.get()) << value;
    EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudioVideo) << value;
    endCaptures();
    session_->status.set(kRecorderIdle);
  }
  ASSERT_EQ(prepare({{"RecordingMetadata_AUDIO_ONLY", "true"}}), 0);
  EXPECT_TRUE(session_->audioOnlyMode.get());
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudio);
}

TEST_F(Prepare, TheTypeDecidesWhatIsCaptured) {
  const std::pair<int, CaptureType> rows[] = {
      {1, CaptureType::audio}, {2, CaptureType::audioAndVideo}, {3, CaptureType::video}};
  for (const auto& [type, kind] : rows) {
    session_->recordingType.set(type);
    ASSERT_EQ(prepare(), 0);
    EXPECT_EQ(framework_->controller(framework_->controllersMade() - 1)->settings()->captureType, kind);
    endCaptures();
    session_->status.set(kRecorderIdle);
  }
}

TEST_F(Prepare, UnattendedMinutesAreReadAsAtoiDoes) {
  ASSERT_EQ(prepare({{"RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "12min"}}), 0);
  EXPECT_EQ(session_->stop_times.maxUnattendedRecordingMinutes.get(), 12);
}

TEST_F(Prepare, DurationOfTheContextIsTheLongestRecording) {
  context_->options.duration.set(77);
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(framework_->controller(0)->settings()->maxDurationMinutes, 77U);
}

TEST_F(Prepare, AStartMayAskForMoreThanTheUsualLength) {
  const std::pair<const char*, std::uint32_t> rows[] = {
      {"600", 600}, {"240.1", 241}, {"50", 240}, {"0", 240}, {"", 240}};
  for (const auto& [minutes, limit] : rows) {
    ASSERT_EQ(prepare({{"RecordingMetadata_MAX_RECORDING_MINUTES", minutes}}), 0);
    EXPECT_EQ(framework_->controller(framework_->controllersMade() - 1)->settings()->maxDurationMinutes,
              limit)
        << minutes;
    endCaptures();
    session_->status.set(kRecorderIdle);
  }
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(framework_->controller(framework_->controllersMade() - 1)->settings()->maxDurationMinutes, 240U);
}

TEST_F(Prepare, AnAdHocRecordingEndsWhenItsOperatorSaid) {
  // Its preferences come from the user's file, which does not exist here, and from the defaults.
  testing::writePreferences(testing::capturePreferences(repository_.path()));
  context_->options.adhoc.set(true);
  context_->options.adhoc_output_file.set(movie("out.mov"));
  context_->options.duration.set(77);
  ASSERT_EQ(prepare({{"RecordingMetadata_MAX_RECORDING_MINUTES", "600"}}), 0);
  EXPECT_EQ(framework_->controller(0)->settings()->maxDurationMinutes, 77U);
}

TEST_F(Prepare, ADurationBelowOneMeansNoLimit) {
  for (const int duration : {0, -5}) {
    context_->options.duration.set(duration);
    ASSERT_EQ(prepare(), 0);
    EXPECT_EQ(framework_->controller(framework_->controllersMade() - 1)->settings()->maxDurationMinutes, 0U);
    endCaptures();
    session_->status.set(kRecorderIdle);
  }
}

TEST_F(Prepare, ASegmentLengthOverridesTheDuration) {
  PlistDictionary preferences = testing::capturePreferences(repository_.path());
  // Only the length matters, truncated to 32 bits, even when continuous recording is off.
  preferences["ContinuousRecording"] =
      PlistDictionary{{"Enabled", false}, {"RecordingSegmentLength", std::int64_t{0x100000005}}};
  testing::writePreferences(preferences);
  context_->options.duration.set(77);
  ASSERT_EQ(prepare({{"RecordingMetadata_MAX_RECORDING_MINUTES", "600"}}), 0);
  EXPECT_EQ(framework_->controller(0)->settings()->maxDurationMinutes, 5U);
}

TEST_F(Prepare, TheFrameRateOfThePreferencesIsRequested) {
  const std::pair<const char*, double> rows[] = {{"25", 25}, {"29.97", 29.97}, {"0", 30}, {"fast", 30}};
  for (const auto& [text, rate] : rows) {
    context_->recording.recording_video_maximum_frame_rate.set(text);
    ASSERT_EQ(prepare(), 0);
    EXPECT_EQ(framework_->controller(framework_->controllersMade() - 1)->settings()->maximumFrameRate, rate);
    endCaptures();
    session_->status.set(kRecorderIdle);
  }
}

TEST_F(Prepare, FileRecordingTakesTheInputFileAndNoController) {
  session_->recordingType.set(kRecordingTypeFile);
  context_->recording.input_file.set(movie("in.mov"));
  ASSERT_EQ(prepare({{"RecordingMetadata_AUDIO_ONLY", "true"}}), 0);
  EXPECT_EQ(session_->filename.get(), movie("in.mov"));
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeFile);
  EXPECT_EQ(framework_->controllersMade(), 0U);
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
  EXPECT_TRUE(testing::waitUntil([&] { return session_->startTime.get().has_value(); }));
}

TEST_F(Prepare, AdhocTakesTheOutputFile) {
  session_->recordingType.set(kRecordingTypeFile);
  context_->options.adhoc.set(true);
  context_->options.adhoc_output_file.set(movie("out.mov"));
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(session_->filename.get(), movie("out.mov"));
  EXPECT_TRUE(testing::waitUntil([&] { return session_->startTime.get().has_value(); }));
}

TEST_F(Prepare, IsRefusedWhenTheAgentIsNotRunning) {
  context_->state.running.set(false);
  EXPECT_EQ(prepare(), 1);
  EXPECT_TRUE(journal_.entries().empty());
}

TEST_F(Prepare, IsRefusedWithoutARepository) {
  context_->recording.recording_repository_path.set(std::nullopt);
  EXPECT_EQ(prepare(), 1);
  EXPECT_TRUE(log_.contains(kLogCritical, "Internal error occurred"));
}

TEST_F(Prepare, UnknownTypesAreRefused) {
  for (const int type : {0, 5, -1}) {
    session_->recordingType.set(type);
    session_->metadata.set(parameters({{"a", "b"}}));
    EXPECT_EQ(prepare(), 1);
    EXPECT_EQ(session_->error.get(), 1);
    EXPECT_EQ(session_->metadata.get(), nullptr);
    EXPECT_EQ(session_->status.get(), kRecorderIdle);
  }
  EXPECT_EQ(journalCount("recordRuntimeError 1"), 3);
}

TEST_F(Prepare, NeedsASessionAndAPath) {
  constexpr const char* kLine = "Invalid Arguments in function LXAgentRecordPrepareCapture";
  EXPECT_EQ(LXAgentRecordPrepareCaptureSync(*context_, std::nullopt, nullptr), 2);
  session_->recordingType.set(kRecordingTypeFile);
  EXPECT_EQ(prepare(), 2);  // no input file
  context_->releaseRecord();
  EXPECT_EQ(prepare(), 2);
  EXPECT_EQ(log_.count(kLogError, kLine), 3);
}

TEST_F(Prepare, ARefusingFrameworkReturnsThree) {
  framework_->on_new_controller = [](auto& controller) { controller.prepare_succeeds = false; };
  EXPECT_EQ(prepare(), 3);
  EXPECT_EQ(session_->error.get(), 3);
  EXPECT_EQ(session_->status.get(), kRecorderIdle);
  EXPECT_EQ(session_->metadata.get(), nullptr);
  EXPECT_TRUE(log_.contains(kLogError, kReceivedError));
}

TEST_F(Prepare, UnusablePreferencesReturnThree) {
  framework_->microphone_well_formed = false;
  EXPECT_EQ(prepare(), 3);
  EXPECT_TRUE(log_.contains(kLogCritical,
                            "Unable to load the recording context, exception = Unknown device ID: microphone "
                            "for preference: RecordingAudioInput"));
  EXPECT_TRUE(log_.contains(kLogError, kReceivedError));
}

TEST_F(Prepare, WhileRecordingReturnsFourAndKeepsTheRecording) {
  ASSERT_EQ(prepare(), 0);
  const std::string before = session_->recording_uuid.get();
  const auto controller = session_->captureController.get();
  EXPECT_EQ(prepare({{"RecordingMetadata_RECORDING_UUID", "R2"}}), 4);
  EXPECT_TRUE(log_.contains(kLogError, "Unable to start, capture not idle"));
  EXPECT_EQ(journalCount("recordRuntimeError 4"), 1);
  EXPECT_EQ(session_->filename.get(), movie("R1.mov"));
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
  EXPECT_EQ(session_->captureController.get(), controller);
  EXPECT_NE(session_->recording_uuid.get(), before);
  EXPECT_EQ(session_->error.get(), 4);
  EXPECT_EQ(framework_->controllersMade(), 1U);
}

TEST_F(Prepare, TooLittleSpaceReturnsThirtyAndKeepsTheError) {
  session_->diskSpaceCutoffInMB.set(0xFFFFFFFFU);
  session_->error.set(3);
  EXPECT_EQ(prepare(), 30);
  EXPECT_EQ(session_->error.get(), 3);
  EXPECT_EQ(session_->recording_uuid.get(), "");
  ASSERT_EQ(log_.entries().size(), 1U);
  EXPECT_EQ(log_.entries()[0].level, 4);
  EXPECT_THAT(log_.entries()[0].text, ::testing::MatchesRegex("[0-9]+ MB is below threshold -1 MB"));
}

TEST_F(Prepare, AVolumeThatCannotBeMeasuredPassesTheThreshold) {
  session_->diskSpaceCutoffInMB.set(0xFFFFFFFFU);
  context_->recording.recording_repository_path.set(movie("missing/folder"));
  EXPECT_EQ(prepare(), 0);
}

TEST_F(Prepare, DeadlinesAreKept) {
  // A deadline that passes while the camera opens must still end the recording at its first check.
  session_->stop_times.hardStopTime.set(TimeValue{1000, 0});
  ASSERT_EQ(prepare(), 0);
  EXPECT_TRUE(session_->stop_times.hardStopTime.get() ||
              log_.contains(kLogNotice, "Agent recording hit hard stop time"));
}

TEST_F(Prepare, TheRecordedTypeIsThatOfThePreparation) {
  ASSERT_EQ(prepare(), 0);
  session_->recordingType.set(kRecordingTypeFile);  // as new preferences do
  EXPECT_EQ(session_->recordedType(), kRecordingTypeAudioVideo);
  EXPECT_EQ(session_->copy()->recordedType(), kRecordingTypeAudioVideo);
}

TEST_F(Prepare, ARefusedRequestForSoundChangesNoType) {
  context_->recording.recording_type.set("Audio+Video");
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(LXAgentRecordPrepareCapture(*context_, std::make_shared<const Dictionary>(
                                                       Dictionary{{"RecordingMetadata_AUDIO_ONLY", "true"}})),
            4);
  EXPECT_EQ(session_->recordedType(), kRecordingTypeAudioVideo);
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudioVideo);
}

TEST_F(Prepare, LogLinesOfThePrepareStepByResult) {
  EXPECT_EQ(LXAgentRecordPrepareCaptureController(*context_, nullptr), 0);
  framework_->on_new_controller = [](auto& controller) {
    controller.prepare_succeeds = false;
    controller.error = CaptureError{CaptureError::kDomain, kDeviceBusy, "camera is busy"};
  };
  EXPECT_EQ(LXAgentRecordPrepareCaptureController(*context_, nullptr), 3);
  EXPECT_TRUE(log_.contains(kLogError, "The capture could not be prepared: camera is busy"));
}

TEST(DiskSpace, UnknownPathGivesAllOnesAndErrno) {
  const VolumeSpace space = measureVolume("/no/such/folder");
  EXPECT_EQ(space.freeKilobytes, ~std::uint64_t{0});
  EXPECT_EQ(space.totalMegabytes, 0);
  EXPECT_EQ(space.error, ENOENT);
}

TEST_F(Prepare, DiskSpaceIsThatOfTheMoviesDirectory) {
  EXPECT_EQ(LXAgentRecordHasDiskSpace(0, movie("A.mov")), 1);
  EXPECT_EQ(LXAgentRecordHasDiskSpace(0xFFFFFFFFU, movie("A.mov")), 0);
  EXPECT_EQ(LXAgentRecordHasDiskSpace(0xFFFFFFFFU, "/no/such/folder/A.mov"), 1);
}

TEST_F(Prepare, VolumeIsThatOfTheFileElseTheRepository) {
  EXPECT_EQ(volumePath(*session_), repository_.path());
  session_->filename.set("");
  EXPECT_EQ(volumePath(*session_), repository_.path());
  session_->filename.set("/elsewhere/A.mov");
  EXPECT_EQ(volumePath(*session_), "/elsewhere");
}

TEST_F(Prepare, StatusReportsAVolumeThatCannotBeMeasured) {
  RecordStatus status;
  EXPECT_EQ(LXAgentRecordGetStatus(session_, &status), 0);
  EXPECT_GT(status.totalDiskMB, 0);
  session_->filename.set("/no/such/folder/A.mov");
  EXPECT_EQ(LXAgentRecordGetStatus(session_, &status), 0);
  EXPECT_EQ(status.totalDiskMB, 0);
  EXPECT_EQ(status.availableDiskMB, static_cast<double>(~std::uint64_t{0} >> 10));
  EXPECT_TRUE(log_.contains(kLogError, "statfs failed: 2"));
}

}  // namespace
}  // namespace lmx
