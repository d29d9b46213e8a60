// Drives the capture on behalf of commands and signals.
#include "agent/capture_actions.h"

#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "model/metadata_keys.h"
#include "platform/identifiers.h"
#include "platform/log.h"
#include "record/prepare_capture.h"
#include "record/preview_controller.h"
#include "record/recording_limits.h"
#include "record/stop_capture.h"
#include "support/format.h"

namespace lmx {

std::shared_ptr<LMRCaptureController> CaptureActions::captureController() const {
  const auto record = session();
  return record ? record->captureController.get() : nullptr;
}

int CaptureActions::prepareCapture() {
  context_.logDebug("Process prepareCapture");
  const SharedDictionary properties = context_.state.properties.get();
  context_.state.status.set(kRecordNotRunning);  // the result if an exception ends this function
  const int result = LXAgentRecordPrepareCapture(
      context_, std::make_shared<const Dictionary>(properties ? *properties : Dictionary{}));
  context_.state.status.set(result);
  return result;
}

int CaptureActions::startRecording(const SharedDictionary& properties) {
  const auto record = session();
  const bool continuous = context_.recording.isContinuous();
  context_.state.status.set(kRecordSuccess);
  // A refused START must not touch what runs: not its parameters, its limits, nor its marks.
  if (const auto refusal = record && !continuous ? LXAgentRecordRefusal(*record) : std::nullopt) {
    context_.state.status.set(*refusal);
    return *refusal;
  }
  context_.state.properties.set(properties);
  if (!record) return continuous ? kRecordSuccess : prepareCapture();
  const std::string request = newUUIDString();
  record->preparing_request.set(request);
  const auto prepared = [](AgentRecord* session) { session->preparing_request.set({}); };
  const std::unique_ptr<AgentRecord, decltype(prepared)> end_of_preparation(record.get(), prepared);
  configure(*record, *properties);
  const int result = continuous ? kRecordSuccess : prepareCapture();
  if (result == kRecordSuccess) beginRequest(*record, request, properties);
  return result;
}

void CaptureActions::configure(AgentRecord& record, const Dictionary& properties) {
  if (record.status.get() == kRecorderIdle) record.stop_times.clear();  // those of an earlier recording
  configureStopTimes(properties, record.stop_times);
  const auto setUnlessEmpty = [&](const char* key, SharedValue<std::optional<std::string>>& to) {
    if (const auto value = lookUp(&properties, key); value && !value->empty()) to.set(value);
  };
  setUnlessEmpty(metadata_key::kAgentUsername, context_.options.user);
  setUnlessEmpty(metadata_key::kAgentPassword, context_.options.password);
  if (lookUp(&properties, metadata_key::kAudioOnly) != "true") return;
  record.recordingType.set(kRecordingTypeAudio);
  LMPLogMessage(context_.log_context(), kLogDebug, "%s: switching to audio-only recording type",
                metadata_key::kAudioOnly);
}

/// The parameters that a restart needs. Who submits may have been named by an earlier START.
SharedDictionary CaptureActions::withSubmitter(const RecordingRequest& request) {
  if (!lookUp(request.properties, metadata_key::kAdHocWorkflowUUID)) return request.properties;
  Dictionary all = *request.properties;
  if (request.user) all[metadata_key::kJobUser] = *request.user;
  if (request.password) all[metadata_key::kJobPassword] = *request.password;
  return std::make_shared<const Dictionary>(std::move(all));
}

void CaptureActions::beginRequest(AgentRecord& record, const std::string& uuid,
                                  const SharedDictionary& properties) {
  const RecordingRequest request{.uuid = uuid,
                                 .properties = properties,
                                 .user = context_.options.user.get(),
                                 .password = context_.options.password.get()};
  // Marked before anybody can ask for it.
  if (const auto capture = record.captureController.get())
    capture->setStartWithUUID(request.uuid, shiftedReferenceTime(), withSubmitter(request));
  record.request.set(request);
}

void CaptureActions::startPreview() {
  context_.logDebug("Process startPreview");
  setPreviewRunning(true);
}

void CaptureActions::stopPreview() {
  context_.logDebug("Process stopPreview");
  setPreviewRunning(false);
}

void CaptureActions::setPreviewRunning(bool run) {
  const auto record = session();
  if (const auto preview = record ? record->previewController.get() : nullptr) {
    run ? preview->controller().startPreview() : preview->controller().stopPreview();
  }
  context_.state.status.set(kRecordSuccess);
}

void CaptureActions::pauseCapture() {
  context_.logDebug("Process pauseCapture");
  const auto controller = captureController();
  if (!controller) return;
  const bool wasRecording = controller->recordingState() == kCaptureRecording;
  controller->pauseRecording();
  if (wasRecording) {
    recordDidPauseWithFile(textOrNull(session()->filename.get()),
                           controller->elapsedTimeInMilliseconds() / 1000);
  }
}

void CaptureActions::resumeCapture() {
  context_.logDebug("Process resumeCapture");
  const auto controller = captureController();
  if (!controller) return;
  const bool wasPaused = controller->recordingState() == kCapturePaused;
  controller->resumeRecording();
  if (wasPaused) recordDidResumeWithFile(textOrNull(session()->filename.get()));
}

void CaptureActions::stopCapture() {
  context_.logDebug("Process stopCapture");
  stopOrCancelCapture(false);
}

void CaptureActions::cancelCapture() {
  context_.logDebug("Process cancelCapture");
  stopOrCancelCapture(true);
}

void CaptureActions::cancelRecording() {
  if (const auto controller = captureController())
    controller->cancelRequestWithUUID(session()->request.get().uuid);
  cancelCapture();
}

void CaptureActions::stopOrCancelCapture(bool cancel) {
  if (context_.options.adhoc.get()) return stopOrCancelAdHoc(cancel);
  const auto controller = captureController();
  const auto record = session();
  const bool isFile =
      record && record->status.get() != kRecorderIdle && record->recordedType() == kRecordingTypeFile;
  if (isFile && !cancel) {
    // No capture reports the end of a "File" recording. The engine's own stop does that and creates the job.
    LXAgentRecordStopCapture(record);
  } else if (controller && !isFile) {
    submission_.rememberStopped(controller);
    cancel ? controller->cancelRecording() : controller->stopRecording();
  }
  setRecorderStatusToIdle();
  context_.state.status.set(kRecordSuccess);
}

void CaptureActions::stopOrCancelAdHoc(bool cancel) {
  const auto controller = captureController();
  const auto record = session();
  if (!record) return;
  if (cancel) {
    if (controller) controller->cancelRequestWithUUID(record->recording_uuid.get());
    return;
  }
  if (controller) controller->setStopWithUUID(record->recording_uuid.get(), shiftedReferenceTime());
  stopRecording();
}

void CaptureActions::stopRecording() {
  context_.logDebug("Process stopRecording");
  if (!session()) return;
  const SharedDictionary properties = context_.state.properties.get();
  if (!lookUp(properties, metadata_key::kAdHocFilePath) &&
      !lookUp(properties, metadata_key::kRecordingUUID)) {
    LMPLogMessage(context_.log_context(), kLogAlert,
                  "Recording canceled, missing RecordingMetadata_RECORDING_UUID.");
    return;
  }
  if (context_.recording.isContinuous()) {
    submission_.submitStoppedRecording();
  } else if (!context_.options.adhoc.get()) {  // in ad-hoc mode stopCapture is the caller
    stopCapture();
  }
}

void CaptureActions::setRecorderStatusToIdle() {
  if (const auto record = session()) record->status.set(kRecorderIdle);
}

double CaptureActions::shiftedReferenceTime() const {
  return secondsSinceReferenceDate() - context_.state.timeshift_seconds.get();
}

/// A PAUSE has closed the span of its request as well. Without a span nothing would be recorded.
void CaptureActions::resumeCaptureAndRequest() {
  resumeCapture();
  const auto controller = captureController();
  if (!controller) return;
  const RecordingRequest request = session()->request.get();
  if (!request.uuid.empty())
    controller->setStartWithUUID(request.uuid, shiftedReferenceTime(), request.properties);
}

void CaptureActions::pauseOrResume(bool pause) {
  if (!context_.options.adhoc.get()) return pause ? pauseCapture() : resumeCaptureAndRequest();
  const auto controller = captureController();
  if (!controller) return;
  const std::string uuid = session()->recording_uuid.get();
  pause ? controller->setStopWithUUID(uuid, shiftedReferenceTime())
        : controller->setStartWithUUID(uuid, shiftedReferenceTime(), context_.state.properties.get());
}

void CaptureActions::recordDidStartWithFile(const std::string& file) const {
  if (!context_.state.running.get()) return;
  LMPLogMessage(context_.log_context(), kLogNotice, "\"%s\" recording started", file.c_str());
}

void CaptureActions::recordDidPauseWithFile(const std::string& file, std::int64_t elapsedSeconds) const {
  if (!context_.state.running.get()) return;
  LMPLogMessage(context_.log_context(), kLogNotice, "\"%s\" recording paused (current duration: %ds)",
                file.c_str(), static_cast<int>(elapsedSeconds));
}

void CaptureActions::recordDidResumeWithFile(const std::string& file) const {
  if (!context_.state.running.get()) return;
  LMPLogMessage(context_.log_context(), kLogNotice, "\"%s\" recording resumed", file.c_str());
}

void CaptureActions::recordRuntimeErrorCallback(int code) const {
  if (!context_.state.running.get()) return;
  LMPLogMessage(context_.log_context(), kLogError, "An error occurred during recording (%d)", code);
}

}  // namespace lmx
