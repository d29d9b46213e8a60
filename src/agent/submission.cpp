// Takes a recording from the end of its capture to the queue.
#include "agent/submission.h"

#include <utility>

#include "capture/api/capture_framework.h"
#include "model/agent_actions.h"
#include "model/codes.h"
#include "model/metadata_keys.h"
#include "platform/log.h"
#include "platform/work_queue.h"
#include "record/capture_delegate.h"
#include "record/stop_capture.h"

namespace lmx {
namespace {

SharedDictionary withUuid(const SharedDictionary& metadata, const std::optional<std::string>& uuid) {
  Dictionary all = metadata ? *metadata : Dictionary{};
  if (uuid) all[metadata_key::kRecordingUUID] = *uuid;
  return std::make_shared<const Dictionary>(std::move(all));
}

/// The START of the recording in `stopped`.
RecordingRequest requestOf(const AgentContext& context, const AgentRecord& stopped) {
  RecordingRequest request = stopped.request.get();
  if (!request.properties) request.properties = context.state.properties.get();
  return request;
}

/// What describes that recording.
SharedDictionary metadataOf(const AgentContext& context, const AgentRecord& stopped) {
  if (SharedDictionary own = stopped.request.get().properties) return own;
  SharedDictionary prepared = stopped.metadata.get();
  return prepared ? prepared : context.state.properties.get();
}

}  // namespace

Submission::Submission(std::shared_ptr<AgentContext> context, AgentActions& actions, RunLoop& loop,
                       const PostProcessScheduler& scheduler)
    : context_(std::move(context)),
      actions_(actions),
      loop_(loop),
      scheduler_(scheduler),
      order_(context_->post_process_list),
      jobs_(context_),
      recovered_(context_, jobs_, order_) {}

bool Submission::isIdle() const {
  return !order_.underWay() && context_->post_process_list.postProcessListCount() == 0 && !scheduler_.busy();
}

// ---- from the stop to the report

void Submission::rememberStopped(const std::shared_ptr<LMRCaptureController>& controller) {
  const auto record = context_->record_context();
  // Nothing runs: the capture has been remembered already, or it was never begun and reports nothing.
  if (reported_.lock() == controller || record->status.get() == kRecorderIdle) return;
  const auto [place, isNew] = stopped_.try_emplace(controller.get());
  if (isNew) place->second = {.record = record->copy(), .ticket = order_.enter()};
}

Submission::Stopped Submission::takeStopped(const void* controller, Ticket reported) {
  Stopped stopped;
  const auto found = stopped_.find(controller);
  if (found != stopped_.end()) {
    stopped = std::move(found->second);
    stopped_.erase(found);
  } else if (const auto record = context_->record_context();
             record && record->captureController.get().get() == controller) {
    stopped = {.record = record->copy(), .ticket = std::move(reported)};
  }
  if (stopped.record) reported_ = stopped.record->captureController.get();
  return stopped;
}

void Submission::captureDidComplete(const void* controller) {
  // The ticket is there before the report has been handled: the agent must not end in between.
  loop_.post(
      [this, controller, ticket = order_.enter()] {
        if (auto stopped = takeStopped(controller, ticket); stopped.record) submit(std::move(stopped));
      },
      Wait::no);
}

void Submission::captureDidCancel(const void* controller) {
  loop_.post(
      [this, controller, ticket = order_.enter()] {
        const Stopped stopped = takeStopped(controller, ticket);
        const auto record = context_->record_context();
        if (record && record->captureController.get().get() == controller) actions_.setRecorderStatusToIdle();
        if (!stopped.record) return;
        dispatchAsync([this, stopped] {
          const auto capture = stopped.record->captureController.get();
          if (!capture) return;
          HandOffOrder::deliver(*stopped.ticket,
                                recovered_.keep(capture->recoverAbandonedRequests(), *stopped.ticket));
        });
      },
      Wait::no);
}

void Submission::submitStoppedRecording() {
  if (const auto record = context_->record_context())
    submit({.record = record->copy(), .ticket = order_.enter()});
}

void Submission::submit(Stopped stopped) {
  context_->logDebug("Submitting Stopped Recording");
  AgentRecord& record = *stopped.record;
  const auto controller = record.captureController.get();
  const RecordingRequest request = requestOf(*context_, record);
  const double elapsed = controller ? controller->elapsedTimeForRequestWithUUID(request.uuid) : 0;
  // An agent that is ending leaves the recording to the next start, which submits it only if it was stopped.
  if (controller && context_->state.running.get()) controller->submitRequestWithUUID(request.uuid);
  record.metadata.set(
      withUuid(metadataOf(*context_, record), lookUp(request.properties, metadata_key::kRecordingUUID)));
  record.request.set(request);
  record.startTime.set(record.beginning());
  dispatchAsync([this, stopped = std::move(stopped), elapsed] { handOff(stopped, elapsed); });
}

// ---- from the closed capture to the queue, on a worker

/// The session, unless it has moved on to another capture.
std::shared_ptr<AgentRecord> Submission::sessionOf(const LMRCaptureController* controller) const {
  auto record = context_->record_context();
  return record && record->captureController.get().get() == controller ? record : nullptr;
}

void Submission::leaveError(const LMRCaptureController* controller) {
  if (const auto record = sessionOf(controller)) record->error.set(kRecordCannotWrite);
}

void Submission::handOff(const Stopped& stopped, double elapsed) {
  AgentRecord& record = *stopped.record;
  const auto controller = record.captureController.get();
  // When the agent is ending, the next start makes both movie and document.
  if (!controller || !context_->state.running.get()) return;
  const auto movie = makeMovie(record, *controller);
  if (movie) {
    record.stopTime.set(shiftedNow(*context_));
    auto job = announce({.record = stopped.record,
                         .request = record.request.get(),
                         .movie = *movie,
                         .metadata = record.metadata.get(),
                         .started = record.startTime.get(),
                         .stopped = record.stopTime.get(),
                         .seconds = static_cast<std::int64_t>(elapsed)},
                        *stopped.ticket);
    if (context_->state.running.get() || job) settle(stopped, *controller, std::move(job));
  } else if (movie.error().code == kNoMedia && context_->state.running.get()) {
    settle(stopped, *controller, nullptr);
  }
  // On the main thread, so that no START comes between the question and the answer.
  loop_.post(
      [this, controller] {
        if (sessionOf(controller.get())) actions_.setRecorderStatusToIdle();
      },
      Wait::no);
}

Result<std::string, CaptureError> Submission::makeMovie(const AgentRecord& stopped,
                                                        LMRCaptureController& controller) {
  const RecordingRequest request = stopped.request.get();
  const auto uuid = lookUp(request.properties, metadata_key::kRecordingUUID);
  const auto chosen = lookUp(request.properties, metadata_key::kAdHocFilePath);
  const std::string repository = context_->recording.recording_repository_path.get().value_or("");
  const std::string path = chosen.value_or(repository + "/" + uuid.value_or("") + ".mov");
  Result<std::string, CaptureError> movie = path;
  if (chosen) {
    movie = controller.processRequestBeside(request.uuid, path);
  } else if (auto error = controller.processRequestWithUUID(request.uuid, path)) {
    movie = *std::move(error);
  }
  logEarlyEnd(controller, path);
  if (movie) return movie;
  LMPLogMessage(context_->log_context(), kLogCritical, "The recording could not be finished: %s",
                movie.error().message.c_str());
  actions_.recordRuntimeErrorCallback(kRecordCannotWrite);
  leaveError(&controller);
  return movie;
}

void Submission::logEarlyEnd(LMRCaptureController& controller, const std::string& path) {
  const auto cause = controller.lastError();
  if (!cause) return;
  LMPLogMessage(context_->log_context(), kLogError, "The capture of \"%s\" ended early: %s", path.c_str(),
                cause->message.c_str());
  // A lost device is handled elsewhere. Otherwise a disk or an encoder has failed.
  if (!meansDeviceLost(cause)) leaveError(&controller);
}

/// The capture forgets its recording before the job can begin: a crash must not submit it twice. One without
/// its document stays in the capture's journal, and the next start writes that.
void Submission::settle(const Stopped& stopped, LMRCaptureController& controller,
                        std::shared_ptr<AgentSubmit> job) {
  const std::string request = stopped.record->request.get().uuid;
  HandOffOrder::Jobs jobs;
  if (job && !job->documented()) {
    if (!controller.requestQueued(request)) return leaveToTheNextStart(*job);
  } else {
    controller.requestHandedOver(request);
    jobs = recovered_.keep(controller.recoverAbandonedRequests(), *stopped.ticket);
  }
  if (job) jobs.insert(jobs.begin(), std::move(job));
  HandOffOrder::deliver(*stopped.ticket, std::move(jobs));
}

/// Otherwise the next start would submit it a second time.
void Submission::leaveToTheNextStart(const AgentSubmit& job) const {
  if (job.stored) job.stored->remove();
  LMPLogMessage(
      context_->log_context(), kLogError,
      "\"%s\" is submitted by the next start: neither its document nor its journal could be written",
      job.recording_file_path.value_or("").c_str());
}

std::shared_ptr<AgentSubmit> Submission::announce(const JobMaker::Finished& finished,
                                                  const HandOffOrder::Ticket& ticket) {
  if (!context_->state.running.get()) return nullptr;
  LMPLogMessage(context_->log_context(), kLogNotice, "\"%s\" recording stopped (duration: %ds)",
                finished.movie.c_str(), static_cast<int>(finished.seconds));
  return jobs_.wantsSubmission(finished.request.properties) ? jobs_.make(finished, ticket) : nullptr;
}

void Submission::announceStop(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                              const SharedDictionary& metadata, Time atTime, std::int64_t elapsedSeconds,
                              Time stoppedTime, bool canceled) {
  const Ticket ticket = order_.enter();
  if (auto job = announce({.record = session,
                           .request = requestOf(*context_, *session),
                           .movie = file,
                           .metadata = metadata,
                           .started = atTime,
                           .stopped = stoppedTime,
                           .seconds = elapsedSeconds,
                           .canceled = canceled},
                          *ticket)) {
    HandOffOrder::deliver(*ticket, {std::move(job)});
  }
}

}  // namespace lmx
