// A look at a camera.
#include "capture/preview_controller.h"

#include <gtest/gtest.h>

#include <chrono>
#include <thread>

#include "capture/gst_capture_framework.h"
#include "tests/unit/capture/capture_harness.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::Capture;
using testing::Folder;

constexpr const char* kCamera = "test://video?size=320x180";

TEST(PreviewController, HasTheCameraOpenOnlyWhileItRuns) {
  PreviewController preview(nullptr);
  CaptureError error;
  ASSERT_TRUE(preview.attachIOWithDevice(kCamera, &error));
  EXPECT_FALSE(preview.isPreviewRunning());
  EXPECT_EQ(preview.session(), nullptr);
  preview.startPreview();
  ASSERT_NE(preview.session(), nullptr);
  EXPECT_TRUE(preview.session()->isRunning());
  preview.stopPreview();
  EXPECT_EQ(preview.session(), nullptr);
}

TEST(PreviewController, ACameraThatIsBeingOpenedIsNotOpenedAgain) {
  GstCaptureFramework framework;
  auto ahead = framework.openAhead(kCamera);
  ASSERT_NE(ahead, nullptr);
  const auto preview = framework.newPreviewController(ahead);
  CaptureError error;
  EXPECT_TRUE(preview->attachIOWithDevice(kCamera, &error));
  EXPECT_FALSE(ahead->isOpening());
  EXPECT_TRUE(ahead->isRunning());
  EXPECT_EQ(ahead.use_count(), 1) << "once it is proved nobody else holds it open";
}

TEST(PreviewController, ACameraThatFailedAheadIsNotTriedAgain) {
  GstCaptureFramework framework;
  auto ahead = framework.openAhead("file:///nowhere.mov");
  ASSERT_NE(ahead, nullptr);
  while (ahead->isOpening()) std::this_thread::sleep_for(std::chrono::milliseconds(1));
  EXPECT_FALSE(ahead->isRunning());
  testing::LogCapture log;
  CaptureError error;
  EXPECT_FALSE(framework.newPreviewController(ahead)->attachIOWithDevice("file:///nowhere.mov", &error));
  EXPECT_EQ(error.code, kDeviceNotFound);
  EXPECT_FALSE(log.mentions("Capture device lost"));
  EXPECT_EQ(framework.openAhead("nonsense"), nullptr);
}

TEST(PreviewController, AnotherCameraThanTheOneThatIsOpenMayBeChosen) {
  GstCaptureFramework framework;
  const auto ahead = framework.openAhead("file:///nowhere.mov");
  CaptureError error;
  EXPECT_TRUE(framework.newPreviewController(ahead)->attachIOWithDevice(kCamera, &error));
}

TEST(PreviewController, ACameraThatIsNotThereIsRefused) {
  PreviewController preview(nullptr);
  CaptureError error;
  EXPECT_FALSE(preview.attachIOWithDevice("file:///nowhere.mov", &error));
  EXPECT_EQ(error.code, kDeviceNotFound);
}

TEST(PreviewController, SharesItsCameraWithARecordingOfOtherSettings) {
  PreviewController preview(nullptr);
  CaptureError error;
  ASSERT_TRUE(preview.attachIOWithDevice(kCamera, &error));
  preview.startPreview();
  const Folder folder;
  Capture capture(folder, kCamera, "test://audio");
  capture.settings.maximumFrameRate = 15;
  ASSERT_TRUE(capture.prepare());
  EXPECT_EQ(capture.controller->session().get(), preview.session().get());
  capture.controller->cancelRecording();
  ASSERT_EQ(capture.reports->wait(), testing::Reports::Kind::cancel);
  EXPECT_EQ(capture.controller->session(), nullptr);
  EXPECT_TRUE(preview.session()->isRunning()) << "the preview still needs them";
}

TEST(PreviewController, ACameraThatWasLostIsOpenedAnewByTheNextRecording) {
  PreviewController preview(nullptr);
  CaptureError error;
  const std::string camera = "test://video?size=320x180&lost-after=0.3";
  ASSERT_TRUE(preview.attachIOWithDevice(camera, &error));
  preview.startPreview();
  const auto lost = std::dynamic_pointer_cast<Source>(preview.session());
  while (lost->isRunning()) std::this_thread::sleep_for(std::chrono::milliseconds(10));
  const Folder folder;
  Capture capture(folder, camera, "test://audio");
  ASSERT_TRUE(capture.prepare());
  EXPECT_NE(capture.controller->session(), lost);
  capture.controller->cancelRecording();
  ASSERT_EQ(capture.reports->wait(), testing::Reports::Kind::cancel);
}

TEST(PreviewController, APreviewWhoseCameraWasLostCanBeStartedAgain) {
  PreviewController preview(nullptr);
  CaptureError error;
  ASSERT_TRUE(preview.attachIOWithDevice("test://video?size=320x180&lost-after=0.3", &error));
  preview.startPreview();
  const auto lost = std::dynamic_pointer_cast<Source>(preview.session());
  while (lost->isRunning()) std::this_thread::sleep_for(std::chrono::milliseconds(10));
  EXPECT_TRUE(preview.isPreviewRunning()) << "somebody has to stop it";
  preview.startPreview();
  EXPECT_NE(preview.session(), lost);
  EXPECT_TRUE(preview.session()->isRunning());
}

}  // namespace
}  // namespace lmx
