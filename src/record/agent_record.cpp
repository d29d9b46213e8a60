// Copies and cleans up the recording session.
#include "record/agent_record.h"

#include "model/agent_context.h"
#include "record/capture_delegate.h"
#include "record/capture_thread.h"
#include "record/preview_controller.h"
#include "record/stop_capture.h"

namespace lmx {

std::shared_ptr<AgentContext> newAgentContext() {
  return std::make_shared<AgentContext>(std::make_shared<AgentRecord>());
}

AgentRecord::~AgentRecord() { cleanup(); }

std::int32_t AgentRecord::recordedType() const {
  const std::int32_t type = recordedType_.get();
  return type == kRecordingTypeNone ? recordingType.get() : type;
}

std::string AgentRecord::addressedRequest() const {
  const std::string preparing = preparing_request.get();
  return preparing.empty() ? request.get().uuid : preparing;
}

void AgentRecord::updateLastContact() {
  lastContact.set(lmp_gettimeofday());
  if (status.get() != kRecorderIdle) stop_times.updateSoftStopTime();
}

AgentRecord::Time AgentRecord::beginning() const {
  const Time start = startTime.get();
  const Time launch = launchTime.get();
  if (!start || (launch && lmp_diff_timeval(*start, *launch) < 0)) return launch;
  return start;
}

std::shared_ptr<AgentRecord> AgentRecord::copy() const {
  auto other = std::make_shared<AgentRecord>();
  other->is_copy_ = true;
  const auto take = [](auto& to, const auto& from) { to.set(from.get()); };
  take(other->recordingType, recordingType);
  take(other->diskSpaceCutoffInMB, diskSpaceCutoffInMB);
  take(other->recordedType_, recordedType_);
  take(other->filename, filename);
  take(other->recording_uuid, recording_uuid);
  take(other->audioOnlyMode, audioOnlyMode);
  take(other->metadata, metadata);
  take(other->videoWidth, videoWidth);
  take(other->videoHeight, videoHeight);
  take(other->request, request);
  take(other->status, status);
  take(other->error, error);
  take(other->launchTime, launchTime);
  take(other->startTime, startTime);
  take(other->stopTime, stopTime);
  take(other->elapsedTime, elapsedTime);
  take(other->lastContact, lastContact);
  other->stop_times.take(stop_times);
  take(other->previewController, previewController);
  take(other->captureController, captureController);
  take(other->captureControllerDelegate, captureControllerDelegate);
  take(other->captureThread, captureThread);
  return other;
}

void AgentRecord::releaseCapture() {
  captureThread.set(nullptr);
  previewController.set(nullptr);
  captureController.set(nullptr);
  captureControllerDelegate.set(nullptr);
}

void AgentRecord::cleanup() {
  if (cleaned_up_.exchange(true)) return;
  // Only the session itself may stop a capture; a copy describes one that has already been stopped. The
  // pointer is non-owning: cleanup also runs in the destructor, where no owner is left.
  if (status.get() == kRecorderRecording && !is_copy_) {
    LXAgentRecordStopCapture(std::shared_ptr<AgentRecord>(std::shared_ptr<AgentRecord>(), this));
  }
  filename.set(std::nullopt);
  autoShutoffCheckTimer.set(false);
  for (auto* time : {&elapsedTime, &launchTime, &startTime, &stopTime, &lastContact}) time->set(std::nullopt);
  stop_times.clear();
  metadata.set(nullptr);
  releaseCapture();
  recording_uuid.set({});
}

}  // namespace lmx
