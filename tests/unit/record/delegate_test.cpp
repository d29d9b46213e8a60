// Reports of a capture controller, and the preview controller.
#include "capture/api/capture_framework.h"
#include "record/capture_delegate.h"
#include "record/create_preview.h"
#include "record/preview_controller.h"
#include "tests/unit/record/engine_fixture.h"

namespace lmx {
namespace {

using testing::ScriptedCaptureController;

class Delegate : public EngineTest {
 protected:
  Delegate() {
    session_->captureController.set(controller_);
    context_->recording.recording_type.set("Video");
    session_->recordingType.set(kRecordingTypeAudio);
    session_->audioOnlyMode.set(true);
  }
  std::shared_ptr<ScriptedCaptureController> controller_ =
      std::make_shared<ScriptedCaptureController>(journal_);
  LMRCaptureDelegate delegate_{controller_.get()};
};

TEST_F(Delegate, DeviceIsLostByTheseCodesOfTheFrameworkOnly) {
  for (const int code : {1002, 1003, 1100, 1200, 1201, 1203, 1300, 1302}) {
    delegate_.recordError.set(CaptureError{CaptureError::kDomain, code, ""});
    EXPECT_TRUE(delegate_.deviceDisconnected()) << code;
    delegate_.recordError.set(CaptureError{"another.domain", code, ""});
    EXPECT_FALSE(delegate_.deviceDisconnected()) << code;
  }
  for (const int code : {0, 1000, 1001, 1004, 1101, 1202, 1301, 1303, 2000, 2001, 2002, 2003}) {
    delegate_.recordError.set(CaptureError{CaptureError::kDomain, code, ""});
    EXPECT_FALSE(delegate_.deviceDisconnected()) << code;
  }
  delegate_.recordError.set(std::nullopt);
  EXPECT_FALSE(delegate_.deviceDisconnected());
}

TEST_F(Delegate, CompletionSubmitsAndRestoresTheType) {
  delegate_.lmrCaptureDidComplete(CaptureError{CaptureError::kDomain, 1003, "gone"});
  EXPECT_EQ(journal_.entries(), (Entries{"captureDidComplete"}));
  EXPECT_EQ(delegate_.recordError.get()->code, 1003);
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeVideo);
  EXPECT_FALSE(session_->audioOnlyMode.get());
}

TEST_F(Delegate, CancellationMakesIdleAndRestoresTheType) {
  delegate_.lmrCaptureDidCancel(CaptureError{CaptureError::kDomain, 1200, "failed"});
  EXPECT_EQ(journal_.entries(), (Entries{"captureDidCancel"}));
  EXPECT_EQ(delegate_.recordError.get()->code, 1200);
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeVideo);
}

TEST_F(Delegate, AReportWithoutErrorKeepsTheEarlierError) {
  delegate_.recordError.set(CaptureError{CaptureError::kDomain, 1002, ""});
  delegate_.lmrCaptureDidComplete(std::nullopt);
  EXPECT_TRUE(delegate_.deviceDisconnected());
}

TEST_F(Delegate, AMissingMicrophoneIsTheLastErrorUntilItIsBack) {
  delegate_.lmrCaptureSoundLost(CaptureError{CaptureError::kDomain, kDeviceRemoved, "gone"});
  EXPECT_EQ(session_->error.get(), kRecordNoInput);
  EXPECT_FALSE(delegate_.deviceDisconnected()) << "the recording goes on";
  delegate_.lmrCaptureSoundBack();
  EXPECT_EQ(session_->error.get(), kRecordSuccess);
  EXPECT_EQ(journal_.entries(), Entries{});
}

TEST_F(Delegate, AnotherErrorOutlastsTheReturnOfTheMicrophone) {
  delegate_.lmrCaptureSoundLost(CaptureError{CaptureError::kDomain, kAudioSilent, "silent"});
  session_->error.set(kRecordCannotWrite);
  delegate_.lmrCaptureSoundBack();
  EXPECT_EQ(session_->error.get(), kRecordCannotWrite);
}

TEST_F(Delegate, TheMicrophoneOfAnEarlierCaptureIsNoErrorOfTheNext) {
  session_->captureController.set(std::make_shared<ScriptedCaptureController>(journal_));
  delegate_.lmrCaptureSoundLost(CaptureError{CaptureError::kDomain, kDeviceRemoved, "gone"});
  EXPECT_EQ(session_->error.get(), kRecordSuccess);
  session_->error.set(kRecordNoInput);
  delegate_.lmrCaptureSoundBack();
  EXPECT_EQ(session_->error.get(), kRecordNoInput);
}

TEST_F(EngineTest, AMicrophoneThatIsMissingAtTheStartIsTheLastErrorOfAGrantedStart) {
  framework_->on_new_controller = [](auto& controller) { controller.microphone_there = false; };
  ASSERT_EQ(prepare(), 0);
  EXPECT_EQ(session_->error.get(), kRecordNoInput);
  EXPECT_EQ(session_->status.get(), kRecorderRecording);
  session_->captureControllerDelegate.get()->lmrCaptureSoundBack();
  EXPECT_EQ(session_->error.get(), kRecordSuccess);
}

TEST_F(Delegate, TypeOfASessionThatHasMovedOnIsKept) {
  session_->captureController.set(std::make_shared<ScriptedCaptureController>(journal_));
  delegate_.lmrCaptureDidComplete(std::nullopt);
  EXPECT_EQ(session_->recordingType.get(), kRecordingTypeAudio);
  EXPECT_TRUE(session_->audioOnlyMode.get());
}

TEST_F(EngineTest, PreviewControllerNamesTheCamera) {
  const auto preview = LXAgentRecordCreatePreviewController("camera", "microphone", true, 400, nullptr);
  ASSERT_NE(preview, nullptr);
  EXPECT_TRUE(log_.contains(kLogDebug, "Using Video Device Named: Scripted camera"));
  EXPECT_EQ(preview->delegate()->frameGrabInterval(), 400);
}

TEST_F(EngineTest, PreviewControllerOfAMissingCameraIsNone) {
  framework_->cameras_attach = false;
  EXPECT_EQ(LXAgentRecordCreatePreviewController("camera", std::nullopt, false, 400, nullptr), nullptr);
  EXPECT_TRUE(log_.contains(
      5, "An error occurred while initializing the capture device: com.zandor.lmxcapture 1002, no camera"));
  EXPECT_EQ(LXAgentRecordCreatePreviewController(std::nullopt, std::nullopt, false, 400, nullptr), nullptr);
}

TEST_F(EngineTest, PreviewFrameIsTheNewestOneAsBase64) {
  MyLMRPreviewControllerDelegate frames(400);
  EXPECT_EQ(frames.base64PreviewFrameCopy(), std::nullopt);
  frames.handleJPEGData({'o', 'l', 'd'});
  frames.handleJPEGData({'n', 'e', 'w'});
  const auto frame = frames.base64PreviewFrameCopy();
  EXPECT_EQ(frame, "bmV3");
}

TEST_F(EngineTest, PreviewRequestTimeIsSetEvenWithoutAFrame) {
  const auto preview = LXAgentRecordCreatePreviewController("camera", std::nullopt, false, 400, nullptr);
  ASSERT_NE(preview, nullptr);
  EXPECT_EQ(preview->mLastPreviewRequestTime.get(), 0);
  EXPECT_EQ(preview->base64PreviewFrameCopy(), std::nullopt);
  EXPECT_GT(preview->mLastPreviewRequestTime.get(), 0);
}

}  // namespace
}  // namespace lmx
