// The session's copy and its end.
#include "record/agent_record.h"

#include "model/agent_context.h"
#include "record/capture_delegate.h"
#include "record/capture_thread.h"
#include "record/engine.h"
#include "record/preview_controller.h"

namespace lmx {

std::shared_ptr<AgentContext> newAgentContext() {
  return std::make_shared<AgentContext>(std::make_shared<AgentRecord>());
}

AgentRecord::~AgentRecord() { cleanup(); }

std::shared_ptr<AgentRecord> AgentRecord::copy() const {
  auto other = std::make_shared<AgentRecord>();
  other->is_copy_ = true;
  other->setFilename(filename());
  other->setMetadata(metadata());
  other->setRecording_uuid(recording_uuid());
  other->setRequest_uuid(request_uuid());
  other->setRequest_properties(request_properties());
  other->setRecordingType(recordingType());
  other->setRecordedType(recordedType_);
  other->setStatus(status());
  other->setError(error());
  other->setDelay(delay());
  other->setMaxUnattendedRecordingMinutes(maxUnattendedRecordingMinutes());
  other->setSessions(sessions());
  other->setVideoPercent(videoPercent());
  other->setVideoWidth(videoWidth());
  other->setVideoHeight(videoHeight());
  other->setAudioSampleRate(audioSampleRate());
  other->setAudioChannelsNumber(audioChannelsNumber());
  other->setAudioOnlyMode(audioOnlyMode());
  other->setDiskSpaceCutoffInMB(diskSpaceCutoffInMB());
  other->setElapsedTime(elapsedTime());
  other->setLaunchTime(launchTime());
  other->setStartTime(startTime());
  other->setStopTime(stopTime());
  other->setHardStopTime(hardStopTime());
  other->setSoftStopTime(softStopTime());
  other->setLastContact(lastContact());
  other->setCaptureThread(captureThread());
  other->setPreviewController(previewController());
  other->setCaptureController(captureController());
  other->setCaptureControllerDelegate(captureControllerDelegate());
  return other;
}

void AgentRecord::cleanup() {
  if (cleaned_up_.exchange(true)) return;
  // A copy describes a capture that has been stopped already; only the session itself may stop one. The
  // pointer owns nothing: cleanup also runs in the destructor, where no owner is left.
  if (status() == kRecorderRecording && !is_copy_) {
    LXAgentRecordStopCapture(std::shared_ptr<AgentRecord>(std::shared_ptr<AgentRecord>(), this));
  }
  setFilename(std::nullopt);
  setAutoShutoffCheckTimer(false);
  for (auto set : {&AgentRecord::setElapsedTime, &AgentRecord::setLaunchTime, &AgentRecord::setStartTime,
                   &AgentRecord::setStopTime, &AgentRecord::setHardStopTime, &AgentRecord::setSoftStopTime,
                   &AgentRecord::setLastContact}) {
    (this->*set)(std::nullopt);
  }
  setCaptureThread(nullptr);
  setMetadata(nullptr);
  setPreviewController(nullptr);
  setCaptureController(nullptr);
  setCaptureControllerDelegate(nullptr);
  setRecording_uuid({});
}

}  // namespace lmx
