// Takes a recording from the end of its capture to the queue.
#include "agent/submission.h"

#include "capture/api/capture_framework.h"
#include "model/agent_actions.h"
#include "model/codes.h"
#include "model/metadata_keys.h"
#include "platform/log.h"
#include "platform/work_queue.h"
#include "postprocess/agent_submit.h"
#include "record/capture_delegate.h"
#include "record/stop_capture.h"

namespace lmx {
namespace {

SharedDictionary withUuid(const SharedDictionary& metadata, const std::optional<std::string>& uuid) {
  Dictionary all = metadata ? *metadata : Dictionary{};
  if (uuid) all[metadata_key::kRecordingUUID] = *uuid;
  return std::make_shared<const Dictionary>(std::move(all));
}

/// The START parameters of the recording in `stopped`.
SharedDictionary propertiesOf(const AgentContext& context, const AgentRecord& stopped) {
  const SharedDictionary own = stopped.request_properties.get();
  return own ? own : context.state.properties.get();
}

/// The metadata of that recording. The request comes first: a START refused in the meantime has replaced the
/// request, and so what is submitted, while `metadata` may still be that of the first START.
SharedDictionary metadataOf(const AgentContext& context, const AgentRecord& stopped) {
  if (SharedDictionary own = stopped.request_properties.get()) return own;
  SharedDictionary prepared = stopped.metadata.get();
  return prepared ? prepared : context.state.properties.get();
}

TimeValue timeValueFrom(double secondsSinceReference) {
  const double seconds = secondsSinceReference + kReferenceDateOffset;
  const auto whole = static_cast<time_t>(seconds);
  return {whole, static_cast<suseconds_t>((seconds - static_cast<double>(whole)) * 1e6)};
}

}  // namespace

/// A recording on its way to the queue: counted for as long as somebody holds it.
class Submission::HandOff {
 public:
  explicit HandOff(std::atomic<int>& count) : count_(count) { ++count_; }
  ~HandOff() { --count_; }
  HandOff(const HandOff&) = delete;
  HandOff& operator=(const HandOff&) = delete;

 private:
  std::atomic<int>& count_;
};

bool Submission::isIdle() const {
  return hand_offs_ == 0 && context_->post_process_list.postProcessListCount() == 0 && !scheduler_.busy();
}

void Submission::rememberStopped(const std::shared_ptr<LMRCaptureController>& controller) {
  if (reported_.lock() == controller) return;
  stopped_.try_emplace(controller.get(), context_->record_context()->copy());
}

std::shared_ptr<AgentRecord> Submission::takeStopped(const void* controller) {
  std::shared_ptr<AgentRecord> stopped;
  const auto found = stopped_.find(controller);
  if (found != stopped_.end()) {
    stopped = std::move(found->second);
    stopped_.erase(found);
  } else if (const auto record = context_->record_context();
             record && record->captureController.get().get() == controller) {
    stopped = record->copy();
  }
  if (stopped) reported_ = stopped->captureController.get();
  return stopped;
}

void Submission::captureDidComplete(const void* controller) {
  loop_.post(
      [this, controller, hand_off = std::make_shared<HandOff>(hand_offs_)] {
        if (const auto stopped = takeStopped(controller)) submit(stopped, hand_off);
      },
      Wait::no);
}

void Submission::captureDidCancel(const void* controller) {
  loop_.post(
      [this, controller] {
        const auto stopped = takeStopped(controller);
        const auto record = context_->record_context();
        if (record && record->captureController.get().get() == controller) actions_.setRecorderStatusToIdle();
        if (!stopped) return;
        dispatchAsync([this, capture = stopped->captureController.get()] {
          if (capture) keepRecovered(capture->recoverAbandonedRequests());
        });
      },
      Wait::no);
}

void Submission::submitStoppedRecording() {
  if (const auto record = context_->record_context()) {
    submit(record->copy(), std::make_shared<HandOff>(hand_offs_));
  }
}

void Submission::submit(const std::shared_ptr<AgentRecord>& stopped,
                        const std::shared_ptr<HandOff>& hand_off) {
  context_->logDebug("Submitting Stopped Recording");
  const auto controller = stopped->captureController.get();
  const double elapsed =
      controller ? controller->elapsedTimeForRequestWithUUID(stopped->request_uuid.get()) : 0;
  const SharedDictionary properties = propertiesOf(*context_, *stopped);
  const auto uuid = lookUp(properties, metadata_key::kRecordingUUID);
  const std::string repository = context_->recording.recording_repository_path.get().value_or("");
  const std::string path = lookUp(properties, metadata_key::kAdHocFilePath)
                               .value_or(repository + "/" + uuid.value_or("") + ".mov");
  stopped->metadata.set(withUuid(metadataOf(*context_, *stopped), uuid));
  stopped->startTime.set(stopped->beginning());
  dispatchAsync([this, stopped, path, elapsed, hand_off] { handOff(stopped, path, elapsed); });
}

/// The session, unless it has moved on to another capture.
std::shared_ptr<AgentRecord> Submission::sessionOf(const LMRCaptureController* controller) const {
  auto record = context_->record_context();
  return record && record->captureController.get().get() == controller ? record : nullptr;
}

void Submission::leaveError(const LMRCaptureController* controller) {
  if (const auto record = sessionOf(controller)) record->error.set(kRecordCannotWrite);
}

void Submission::handOff(const std::shared_ptr<AgentRecord>& stopped, const std::string& path,
                         double elapsed) {
  const auto controller = stopped->captureController.get();
  // When the agent is ending, the next start makes both movie and document.
  if (!controller || !context_->state.running.get()) return;
  const bool settled = finishMovie(stopped, *controller, path, elapsed);
  if (!context_->state.running.get()) return;
  // A movie or document that could not be written stays in the capture's journal. The next start tries again.
  if (settled) {
    controller->requestHandedOver(stopped->request_uuid.get());
    keepRecovered(controller->recoverAbandonedRequests());
  }
  // On the main thread, so that no START comes between the question and the answer.
  loop_.post(
      [this, controller] {
        if (sessionOf(controller.get())) actions_.setRecorderStatusToIdle();
      },
      Wait::no);
}

bool Submission::finishMovie(const std::shared_ptr<AgentRecord>& stopped, LMRCaptureController& controller,
                             const std::string& path, double elapsed) {
  const auto error = controller.processRequestWithUUID(stopped->request_uuid.get(), path);
  if (const auto cause = controller.lastError()) {
    LMPLogMessage(context_->log_context(), kLogError, "The capture of \"%s\" ended early: %s", path.c_str(),
                  cause->message.c_str());
    // A lost device is handled elsewhere. Otherwise a disk or an encoder has failed.
    if (!meansDeviceLost(cause)) leaveError(&controller);
  }
  if (!error) {
    stopped->stopTime.set(shiftedNow(*context_));
    return announceStop(stopped, path, stopped->metadata.get(), stopped->startTime.get(),
                        static_cast<std::int64_t>(elapsed), stopped->stopTime.get(), false);
  }
  LMPLogMessage(context_->log_context(), kLogCritical, "The recording could not be finished: %s",
                error->message.c_str());
  actions_.recordRuntimeErrorCallback(kRecordCannotWrite);
  leaveError(&controller);
  return error->code == kNoMedia;
}

bool Submission::wantsSubmission(const SharedDictionary& properties) const {
  return !context_->options.adhoc.get() && !context_->options.submit_disabled.get() &&
         lookUp(properties, metadata_key::kAdHocSubmitDisabled) != "1";
}

bool Submission::announceStop(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                              const SharedDictionary& metadata, Time atTime, std::int64_t elapsedSeconds,
                              Time stoppedTime, bool canceled) {
  if (!context_->state.running.get()) return true;
  LMPLogMessage(context_->log_context(), kLogNotice, "\"%s\" recording stopped (duration: %ds)", file.c_str(),
                static_cast<int>(elapsedSeconds));
  const SharedDictionary properties = propertiesOf(*context_, *session);
  if (!wantsSubmission(properties)) return true;
  auto job = std::make_shared<AgentSubmit>();
  job->recorded = session->copy();
  job->adhoc_workflow_uuid = lookUp(properties, metadata_key::kAdHocWorkflowUUID);
  job->setPropertyValuesWithContext(context_, file, atTime, stoppedTime, elapsedSeconds, metadata, canceled);
  if (job->writeProperties() != 0) {
    LMPLogMessage(context_->log_context(), kLogCritical,
                  "Internal error occurred in did stop with success callback");
    context_->state.running.set(false);
    return true;
  }
  const bool documented = job->documented();
  context_->post_process_list.postProcessListAddJob(std::move(job));
  return documented;
}

void Submission::recoverUnfinishedRecordings(std::shared_ptr<CaptureFramework> framework) {
  const auto repository = context_->recording.recording_repository_path.get();
  if (!repository) return;
  // On a worker: a long recording may have to be copied, and the agent must accept commands meanwhile.
  dispatchAsync([this, repository, framework = std::move(framework)] {
    keepRecovered(framework->recoverUnfinished(*repository));
  });
}

void Submission::keepRecovered(const std::vector<RecoveredRecording>& recordings) {
  for (const RecoveredRecording& recording : recordings) {
    AgentSubmit document;
    auto record = std::make_shared<AgentRecord>();
    record->recordingType.set(recording.recordingType);
    document.recorded = record;
    document.setPropertyValuesWithContext(
        context_, recording.path, timeValueFrom(recording.startTime), timeValueFrom(recording.stopTime),
        static_cast<std::int64_t>(recording.duration), recording.parameters, false);
    // Without its document the movie stays in the journal. The next start tries again.
    if (!document.tryWriteProperties()) continue;
    recording.forget();
    LMPLogMessage(context_->log_context(), kLogNotice,
                  "Recovered unfinished recording \"%s\" (duration: %ds); it was not submitted",
                  recording.path.c_str(), static_cast<int>(recording.duration));
  }
}

}  // namespace lmx
