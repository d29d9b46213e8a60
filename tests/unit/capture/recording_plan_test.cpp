// Settings to a plan.
#include "capture/recording_plan.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

LMRRecordingContext settings(bool video, bool audio) {
  LMRRecordingContext settings;
  settings.videoEnabled = video;
  settings.audioEnabled = audio;
  if (video) settings.videoDeviceID = "test://video";
  return settings;
}

TEST(RecordingPlan, TakesAnyMicrophoneWhereNoneIsNamed) {
  const auto plan = planRecording(settings(true, true));
  ASSERT_TRUE(plan);
  EXPECT_EQ(plan->camera, "test://video");
  EXPECT_EQ(plan->microphone, kAnyMicrophone);
  EXPECT_TRUE(plan->encoding.video && plan->encoding.audio);
}

TEST(RecordingPlan, AMissingCameraIsNamed) {
  auto withoutCamera = settings(true, false);
  withoutCamera.videoDeviceID.reset();
  EXPECT_EQ(planRecording(withoutCamera).error().message, "no camera is there");
}

TEST(RecordingPlan, RateQualityAndLengthComeFromTheSettings) {
  auto wanted = settings(true, false);
  wanted.maximumFrameRate = 25;
  wanted.maxDurationMinutes = 90;
  wanted.videoCompressionOptions = LMRCompressionOptions{.quality = RecordingQuality::best};
  const auto plan = planRecording(wanted);
  ASSERT_TRUE(plan);
  EXPECT_EQ(plan->encoding.video->frameRate, (FrameRate{25, 1}));
  EXPECT_EQ(plan->encoding.video->quality, RecordingQuality::best);
  EXPECT_EQ(plan->maxDuration, std::chrono::minutes(90));
  EXPECT_FALSE(plan->microphone);
}

TEST(RecordingPlan, ThePictureIsNoLargerThanTheSettingsAllow) {
  auto wanted = settings(true, false);
  EXPECT_EQ(planRecording(wanted)->demand.size, kFullHD);
  wanted.maximumSize = {1280, 720};
  const auto plan = planRecording(wanted);
  EXPECT_EQ(plan->demand.size, (PictureSize{1280, 720}));
  EXPECT_EQ(completeEncoding(*plan, {.size = {1920, 1080}, .rate = {}}).video->size,
            (PictureSize{1280, 720}));
  EXPECT_EQ(completeEncoding(*plan, {.size = {640, 480}, .rate = {}}).video->size, (PictureSize{640, 480}));
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
    EXPECT_EQ(planRecording(wanted)->type, code);
  }
}

TEST(RecordingPlan, WhatCanBeNoMicrophoneIsRefused) {
  auto wanted = settings(true, true);
  wanted.audioDeviceID = "banana";
  const auto plan = planRecording(wanted);
  ASSERT_FALSE(plan);
  EXPECT_EQ(plan.error().code, kDeviceNotFound);
  EXPECT_NE(plan.error().message.find("\"banana\" is no microphone identifier"), std::string::npos);
}

struct Rates {
  std::optional<FrameRate> camera;
  double wanted;
  FrameRate movie;
};

TEST(RecordingPlan, TheMovieTicksLikeTheCameraWhereThatIsNotTooFast) {
  const Rates table[] = {
      {FrameRate{25, 1}, 30, {25, 1}},          {FrameRate{30000, 1001}, 30, {30000, 1001}},
      {FrameRate{15, 1}, 30, {15, 1}},          {FrameRate{60, 1}, 30, {30, 1}},
      {FrameRate{50, 1}, 25, {25, 1}},          {std::nullopt, 30, {30, 1}},
      {FrameRate{1, 10}, 30, {30, 1}},          {FrameRate{90000, 1}, 30, {30, 1}},
      {FrameRate{30, 1}, 29.97, {30000, 1001}}, {FrameRate{5, 1}, 30, {5, 1}},
  };
  for (const Rates& row : table) {
    auto wanted = settings(true, false);
    wanted.maximumFrameRate = row.wanted;
    const MovieEncoding encoding = completeEncoding(*planRecording(wanted), {{640, 360}, row.camera});
    EXPECT_EQ(encoding.video->frameRate, row.movie)
        << (row.camera ? row.camera->numerator : 0) << " wanted " << row.wanted;
    EXPECT_EQ(encoding.video->size.width, 640);
  }
}

}  // namespace
}  // namespace lmx
