// Probes the camera and looks for it when it is missing.
#include "agent/device_watch.h"

#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <ctime>
#include <exception>
#include <thread>
#include <utility>

#include "agent/elapsed.h"
#include "agent/recording_in_hand.h"
#include "model/codes.h"
#include "platform/log.h"
#include "prefs/recording_context.h"
#include "record/capture_delegate.h"
#include "record/create_preview.h"
#include "record/preview_controller.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

constexpr std::int64_t kDeviceRetrySeconds = 10;
constexpr const char* kOfflineMessage =
    "Unable to acquire the specified video device. The agent will remain offline until the device becomes "
    "available.";

bool cameraRecords(const AgentRecord& session) {
  const std::int32_t type = session.recordedType();
  return session.status.get() != kRecorderIdle &&
         (type == kRecordingTypeAudioVideo || type == kRecordingTypeVideo);
}

}  // namespace

std::shared_ptr<LMRRecordingContext> DeviceWatch::recordingContext() const {
  try {
    return context_->options.adhoc.get() ? newRecordingContextForAdHoc(*framework_)
                                         : newRecordingContextForDaemon(*framework_);
  } catch (const std::exception& error) {
    LMPLogMessage(nullptr, kLogCritical, "Unable to load the recording context, exception = %s",
                  error.what());
  } catch (...) {
    LMPLogMessage(nullptr, kLogCritical, "Unable to load the recording context.");
  }
  return nullptr;
}

void DeviceWatch::tellOfMissingMicrophone(const LMRRecordingContext& settings) const {
  if (!settings.audioEnabled || framework_->hasMicrophone(settings.audioDeviceID)) return;
  const std::string name = settings.audioDeviceID ? "\"" + *settings.audioDeviceID + "\"" : "(Automatic)";
  LMPLogMessage(context_->log_context(), kLogError,
                "The microphone %s is not there: recordings are silent until it is", name.c_str());
}

std::shared_ptr<CaptureSession> DeviceWatch::openAhead(const LMRRecordingContext& settings) const {
  return settings.videoDeviceID ? framework_->openAhead(*settings.videoDeviceID) : nullptr;
}

void DeviceWatch::probeDevice(const LMRRecordingContext& settings, std::shared_ptr<CaptureSession> ahead) {
  tellOfMissingMicrophone(settings);
  if (!settings.videoDeviceID) return;
  if (LXAgentRecordCreatePreviewController(settings.videoDeviceID, settings.audioDeviceID,
                                           settings.audioEnabled, settings.previewIntervalInMilliseconds,
                                           std::move(ahead))) {
    return;
  }
  LMPLogMessage(context_->log_context(), kLogAlert, "%s", kOfflineMessage);
  context_->state.last_device_check.set(std::time(nullptr));
  device_offline_ = true;
}

void DeviceWatch::deviceFound() {
  if (device_is_back_()) {
    context_->state.last_device_check.set(0);
    shouldDisplayOfflineMessage_ = false;
  } else if (!recordingInHand(*context_)) {
    context_->state.running.set(false);
  }
}

void DeviceWatch::retryDevice(std::int64_t now) {
  const std::int64_t last = context_->state.last_device_check.get();
  if (last < 1) retry_ = std::nullopt;
  if (last < 1 || (!retry_ && isAhead(now, last, kDeviceRetrySeconds + 1))) return;
  // A retry that fails ends the agent, and a START may have found the camera meanwhile. A recording with a
  // picture has it open, so the server need not wait for the end of the recording either.
  if (recordingInHand(*context_)) {
    retry_ = std::nullopt;
    if (cameraRecords(*context_->record_context())) deviceFound();
    return;
  }
  if (!retry_) {
    context_->state.last_device_check.set(now);
    const auto settings = recordingContext();
    if (!settings) return giveUp();
    retry_ = Retry{settings, settings->videoEnabled ? openAhead(*settings) : nullptr};
  }
  if (retry_->camera && retry_->camera->isOpening()) return;
  const Retry retry = *std::exchange(retry_, std::nullopt);
  if (openAgain(*retry.settings, retry.camera)) return deviceFound();
  if (!shouldDisplayOfflineMessage_) return giveUp();
  LMPLogMessage(nullptr, kLogWarning, "%s", kOfflineMessage);
  shouldDisplayOfflineMessage_ = false;
}

void DeviceWatch::giveUp() {
  // The end of the agent would leave a recording on its way to the queue unsubmitted: the next retry decides.
  if (submission_.isIdle()) context_->state.running.set(false);
}

/// @return whether nothing is missing. An agent that doesn't record video has no camera to wait for.
bool DeviceWatch::openAgain(const LMRRecordingContext& settings, std::shared_ptr<CaptureSession> ahead) {
  const auto record = context_->record_context();
  const auto before = record->previewController.get();
  if (!settings.videoEnabled) {
    record->previewController.set(nullptr);
    return true;
  }
  const auto preview = LXAgentRecordCreatePreviewController(
      settings.videoDeviceID, settings.audioDeviceID, settings.audioEnabled,
      settings.previewIntervalInMilliseconds, std::move(ahead));
  // A preview that somebody looks at goes on; the camera stays open from one to the other.
  if (preview && before && before->controller().isPreviewRunning()) {
    preview->mLastPreviewRequestTime.set(before->mLastPreviewRequestTime.get());
    preview->controller().startPreview();
  }
  record->previewController.set(preview);
  return preview != nullptr;
}

bool DeviceWatch::deviceDisconnected() const {
  const auto record = context_->record_context();
  const auto delegate = record ? record->captureControllerDelegate.get() : nullptr;
  if (!delegate || !delegate->deviceDisconnected()) return false;
  if (context_->options.adhoc.get()) return true;
  // A recording of an existing file has no capture, so that the report may still be the one of the capture
  // before.
  return submission_.isIdle() && !recordingInHand(*context_);
}

void DeviceWatch::announceLostDevice() const {
  LMPLogMessage(context_->log_context(), kLogCritical, "The capture device has been disconnected.");
  if (context_->options.adhoc.get()) {
    std::fflush(nullptr);
    _exit(exitStatus(ProcessEnd::deviceLost));
  }
  std::this_thread::sleep_for(2s);
}

}  // namespace lmx
