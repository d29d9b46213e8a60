// The actions that touch the capture. Main thread only.
#include <ctime>

#include "agent/agent_main.h"
#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "platform/log.h"
#include "record/prepare_capture.h"
#include "record/preview_controller.h"
#include "record/stop_capture.h"

namespace lmx {

bool AgentMain::perform(Action action, Wait wait) {
  return loop_.post([this, action] { (this->*action)(); }, wait);
}

std::shared_ptr<LMRCaptureController> AgentMain::captureController() const {
  const auto record = session();
  return record ? record->captureController.get() : nullptr;
}

void AgentMain::prepareCapture() {
  context_->logDebug("Process prepareCapture");
  const SharedDictionary properties = context_->state.properties.get();
  context_->state.status.set(kRecordNotRunning);  // what counts if this ends by an exception
  context_->state.status.set(LXAgentRecordPrepareCapture(
      *context_, std::make_shared<const Dictionary>(properties ? *properties : Dictionary{})));
}

void AgentMain::startPreview() {
  context_->logDebug("Process startPreview");
  const auto record = session();
  if (const auto preview = record ? record->previewController.get() : nullptr)
    preview->controller().startPreview();
  context_->state.status.set(0);
}

void AgentMain::stopPreview() {
  context_->logDebug("Process stopPreview");
  const auto record = session();
  if (const auto preview = record ? record->previewController.get() : nullptr)
    preview->controller().stopPreview();
  context_->state.status.set(0);
}

void AgentMain::pauseCapture() {
  context_->logDebug("Process pauseCapture");
  const auto controller = captureController();
  if (!controller) return;
  const bool wasRecording = controller->recordingState() == 3;
  controller->pauseRecording();
  if (!wasRecording) return;
  const auto record = session();
  recordDidPauseWithFile(record->filename.get().value_or(""), record->metadata.get(),
                         controller->elapsedTimeInMilliseconds() / 1000);
}

void AgentMain::resumeCapture() {
  context_->logDebug("Process resumeCapture");
  const auto controller = captureController();
  if (!controller) return;
  const bool wasPaused = controller->recordingState() == 4;
  controller->resumeRecording();
  if (!wasPaused) return;
  const auto record = session();
  recordDidResumeWithFile(record->filename.get().value_or(""), record->metadata.get());
}

void AgentMain::stopCapture() {
  context_->logDebug("Process stopCapture");
  stopOrCancelCapture(false);
}

void AgentMain::cancelCapture() {
  context_->logDebug("Process cancelCapture");
  stopOrCancelCapture(true);
}

void AgentMain::stopOrCancelCapture(bool cancel) {
  const auto controller = captureController();
  const auto record = session();
  if (context_->options.adhoc.get()) {
    if (!record) return;
    if (cancel) {
      if (controller) controller->cancelRequestWithUUID(record->recording_uuid.get());
      return;
    }
    if (controller) {
      controller->setStopWithUUID(record->recording_uuid.get(),
                                  secondsSinceReferenceDate() - context_->state.timeshift_seconds.get());
    }
    stopRecording();
    return;
  }
  const bool isFile =
      record && record->status.get() != kRecorderIdle && record->recordedType() == kRecordingTypeFile;
  if (isFile && !cancel) {
    // No capture will report the end of a "File" recording: the engine's own stop does, and so makes its job.
    LXAgentRecordStopCapture(record);
  } else if (controller && !isFile) {
    rememberStopped(controller);
    cancel ? controller->cancelRecording() : controller->stopRecording();
  }
  setRecorderStatusToIdle();
  context_->state.status.set(0);
}

void AgentMain::stopRecording() {
  context_->logDebug("Process stopRecording");
  if (!session()) return;
  const SharedDictionary properties = context_->state.properties.get();
  if (!lookUp(properties, "RecordingMetadata_ADHOC_FILE_PATH") &&
      !lookUp(properties, "RecordingMetadata_RECORDING_UUID")) {
    LMPLogMessage(context_->log_context(), kLogAlert,
                  "Recording canceled, missing RecordingMetadata_RECORDING_UUID.");
    return;
  }
  const auto continuous = context_->recording.continuous.get();
  if (continuous && continuous->enabled) {
    submitStoppedRecording();
  } else if (!context_->options.adhoc.get()) {  // there stopCapture is what has called
    stopCapture();
  }
}

void AgentMain::setRecorderStatusToIdle() {
  if (const auto record = session()) record->status.set(kRecorderIdle);
}

void AgentMain::shutDownControl() {
  context_->logDebug("Process shutDownControl");
  cancelCapture();
  if (context_->options.adhoc.get()) return;
  closeTunnel();
  context_->state.last_device_check.set(std::time(nullptr));
}

void AgentMain::shutDownControlBecauseDeviceFailed() {
  if (!context_->options.adhoc.get()) shouldDisplayOfflineMessage_ = true;
  shutDownControl();
}

void AgentMain::recordDidStartWithFile(const std::string& file, const SharedDictionary& /*metadata*/,
                                       std::optional<TimeValue> /*atTime*/) {
  if (!context_->state.running.get()) return;
  LMPLogMessage(context_->log_context(), kLogNotice, "\"%s\" recording started", file.c_str());
}

void AgentMain::recordDidPauseWithFile(const std::string& file, const SharedDictionary& /*metadata*/,
                                       std::int64_t elapsedSeconds) {
  if (!context_->state.running.get()) return;
  LMPLogMessage(context_->log_context(), kLogNotice, "\"%s\" recording paused (current duration: %ds)",
                file.c_str(), static_cast<int>(elapsedSeconds));
}

void AgentMain::recordDidResumeWithFile(const std::string& file, const SharedDictionary& /*metadata*/) {
  if (!context_->state.running.get()) return;
  LMPLogMessage(context_->log_context(), kLogNotice, "\"%s\" recording resumed", file.c_str());
}

void AgentMain::recordRuntimeErrorCallback(int code) {
  if (!context_->state.running.get()) return;
  LMPLogMessage(context_->log_context(), kLogError, "An error occurred during recording (%d)", code);
}

}  // namespace lmx
