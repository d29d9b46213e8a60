// Settings to a plan.
#include "capture/recording_plan.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

std::optional<std::string> noMicrophone() { return std::nullopt; }

LMRRecordingContext settings(bool video, bool audio) {
  LMRRecordingContext settings;
  settings.videoEnabled = video;
  settings.audioEnabled = audio;
  if (video) settings.videoDeviceID = "test://video";
  return settings;
}

TEST(RecordingPlan, TakesTheDefaultMicrophoneWhereNoneIsNamed) {
  const auto plan =
      planRecording(settings(true, true), [] { return std::optional<std::string>("alsa:first"); });
  ASSERT_TRUE(plan);
  EXPECT_EQ(plan->source.videoDevice, "test://video");
  EXPECT_EQ(plan->source.audioDevice, "alsa:first");
  EXPECT_TRUE(plan->encoding.video && plan->encoding.audio);
}

TEST(RecordingPlan, AMissingDeviceIsNamed) {
  const auto noSound = planRecording(settings(true, true), noMicrophone);
  ASSERT_FALSE(noSound);
  EXPECT_EQ(noSound.error().code, kDeviceNotFound);
  EXPECT_EQ(noSound.error().message, "no microphone is there");
  auto withoutCamera = settings(true, false);
  withoutCamera.videoDeviceID.reset();
  EXPECT_EQ(planRecording(withoutCamera, noMicrophone).error().message, "no camera is there");
}

TEST(RecordingPlan, RateQualityAndLengthComeFromTheSettings) {
  auto wanted = settings(true, false);
  wanted.maximumFrameRate = 25;
  wanted.maxDurationMinutes = 90;
  wanted.videoCompressionOptions = LMRCompressionOptions{.quality = RecordingQuality::best};
  const auto plan = planRecording(wanted, noMicrophone);
  ASSERT_TRUE(plan);
  EXPECT_EQ(plan->encoding.video->frameRate, (FrameRate{25, 1}));
  EXPECT_EQ(plan->encoding.video->quality, RecordingQuality::best);
  EXPECT_EQ(plan->maxDuration, std::chrono::minutes(90));
  EXPECT_FALSE(plan->source.audioDevice);
}

TEST(RecordingPlan, TypesAreNumberedAsEverywhere) {
  auto wanted = settings(true, false);
  const std::pair<CaptureType, RecordingTypeCode> types[] = {
      {CaptureType::audio, kRecordingTypeAudio},
      {CaptureType::audioAndVideo, kRecordingTypeAudioVideo},
      {CaptureType::video, kRecordingTypeVideo},
      {CaptureType::file, kRecordingTypeFile}};
  for (const auto& [type, code] : types) {
    wanted.captureType = type;
    EXPECT_EQ(planRecording(wanted, noMicrophone)->type, code);
  }
}

}  // namespace
}  // namespace lmx
