// Finishes what was left, oldest first.
#include "agent/recovered_recordings.h"

#include <algorithm>
#include <utility>

#include "model/metadata_keys.h"
#include "platform/log.h"
#include "platform/work_queue.h"
#include "record/agent_record.h"

namespace lmx {
namespace {

TimeValue timeValueFrom(double secondsSinceReference) {
  const double seconds = secondsSinceReference + kReferenceDateOffset;
  const auto whole = static_cast<time_t>(seconds);
  return {whole, static_cast<suseconds_t>((seconds - static_cast<double>(whole)) * 1e6)};
}

JobMaker::Finished finishedFrom(const RecoveredRecording& recording) {
  auto record = std::make_shared<AgentRecord>();
  record->recordingType.set(recording.recordingType);
  return {.record = std::move(record),
          .request = {.uuid = recording.request,
                      .properties = recording.parameters,
                      .user = lookUp(recording.parameters, metadata_key::kAgentUsername),
                      .password = lookUp(recording.parameters, metadata_key::kAgentPassword)},
          .movie = recording.path,
          .metadata = recording.parameters,
          .started = timeValueFrom(recording.startTime),
          .stopped = timeValueFrom(recording.stopTime),
          .seconds = static_cast<std::int64_t>(recording.duration)};
}

}  // namespace

void RecoveredRecordings::takeUp(std::shared_ptr<CaptureFramework> framework) {
  takeUpJobs();
  const auto repository = context_->recording.recording_repository_path.get();
  if (!repository) return;
  // On a worker: a long recording may have to be copied, and the agent must accept commands meanwhile.
  dispatchAsync([this, repository, framework = std::move(framework), ticket = order_.enter()] {
    auto recordings = framework->recoverUnfinished(*repository);
    std::stable_sort(recordings.begin(), recordings.end(),
                     [](const auto& a, const auto& b) { return a.stopTime < b.stopTime; });
    HandOffOrder::deliver(*ticket, keep(recordings, *ticket));
  });
}

void RecoveredRecordings::takeUpJobs() {
  JobStore::Left left = jobs_.store().takeUp(context_);
  for (const std::string& movie : left.begun) {
    LMPLogMessage(context_->log_context(), kLogWarning,
                  "The agent ended while \"%s\" was being submitted: it is not submitted again",
                  movie.c_str());
  }
  for (auto& job : left.waiting) {
    LMPLogMessage(context_->log_context(), kLogNotice, "\"%s\" still waits for its submission",
                  job->recording_file_path.value_or("").c_str());
    context_->post_process_list.postProcessListAddJob(std::move(job));
  }
}

/// A job that has been stored already stands for the recording.
bool RecoveredRecordings::isToBeSubmitted(const RecoveredRecording& recording) const {
  return recording.submit && jobs_.wantsSubmission(recording.parameters) &&
         !jobs_.store().tookUp(recording.request);
}

bool RecoveredRecordings::writeDocument(const JobMaker::Finished& finished) const {
  AgentSubmit document;
  document.recorded = finished.record;
  document.setPropertyValuesWithContext(context_, finished.movie, finished.started, finished.stopped,
                                        finished.seconds, finished.metadata, false);
  return document.tryWriteProperties();
}

HandOffOrder::Jobs RecoveredRecordings::keep(const std::vector<RecoveredRecording>& recordings,
                                             const HandOffOrder::Ticket& ticket) {
  HandOffOrder::Jobs jobs;
  for (const RecoveredRecording& recording : recordings) {
    const JobMaker::Finished finished = finishedFrom(recording);
    const bool submit = isToBeSubmitted(recording);
    bool documented = false;
    if (submit) {
      auto job = jobs_.make(finished, ticket);
      if (!job) continue;
      documented = job->documented();
      if (!documented) recording.queued();
      jobs.push_back(std::move(job));
    } else {
      documented = writeDocument(finished);
    }
    // Without its document the movie stays in the journal. The next start tries again.
    if (documented) recording.forget();
    if ((!documented && !submit) || jobs_.store().tookUp(recording.request)) continue;
    LMPLogMessage(
        context_->log_context(), kLogNotice,
        submit ? "Finished recording \"%s\" (duration: %ds), which had been stopped; it goes to the server"
               : "Recovered unfinished recording \"%s\" (duration: %ds); it was not submitted",
        recording.path.c_str(), static_cast<int>(recording.duration));
  }
  return jobs;
}

}  // namespace lmx
