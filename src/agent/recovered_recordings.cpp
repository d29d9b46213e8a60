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
  Dictionary given = recording.parameters ? *recording.parameters : Dictionary{};
  RecordingRequest request{.uuid = recording.request,
                           .user = lookUp(&given, metadata_key::kJobUser),
                           .password = lookUp(&given, metadata_key::kJobPassword)};
  given.erase(metadata_key::kJobUser);
  given.erase(metadata_key::kJobPassword);
  request.properties = std::make_shared<const Dictionary>(std::move(given));
  return {.record = std::move(record),
          .request = request,
          .movie = recording.path,
          .metadata = request.properties,
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
    auto recordings = framework->recoverUnfinished(
        *repository, [this](const std::string& request) { return jobs_.store().tookUp(request); });
    std::stable_sort(recordings.begin(), recordings.end(),
                     [](const auto& a, const auto& b) { return a.stopTime < b.stopTime; });
    HandOffOrder::Jobs jobs = keep(recordings, *ticket);
    jobs_.store().forgetBegun();
    HandOffOrder::deliver(*ticket, std::move(jobs));  // last: it tells the others that this has ended
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

bool RecoveredRecordings::writeDocument(const JobMaker::Finished& finished) const {
  AgentSubmit document;
  document.recorded = finished.record;
  document.setPropertyValuesWithContext(context_, finished.movie, finished.started, finished.stopped,
                                        finished.seconds, finished.metadata, false);
  return document.tryWriteProperties();
}

/// @return its job; null when it could not be made, or when the next start is to make it
std::shared_ptr<AgentSubmit> RecoveredRecordings::makeJob(const RecoveredRecording& recording,
                                                          const HandOffOrder::Ticket& ticket) {
  auto job = jobs_.make(finishedFrom(recording), ticket);
  if (!job) return nullptr;
  if (job->documented()) {
    recording.forget();
  } else if (!recording.queued()) {
    if (job->stored) job->stored->remove();  // otherwise the next start would submit it a second time
    return nullptr;
  }
  LMPLogMessage(context_->log_context(), kLogNotice,
                "Finished recording \"%s\" (duration: %ds), which had been stopped; it goes to the server",
                recording.path.c_str(), static_cast<int>(recording.duration));
  return job;
}

HandOffOrder::Jobs RecoveredRecordings::keep(const std::vector<RecoveredRecording>& recordings,
                                             const HandOffOrder::Ticket& ticket) {
  HandOffOrder::Jobs jobs;
  for (const RecoveredRecording& recording : recordings) {
    if (recording.submit && jobs_.wantsSubmission(recording.parameters)) {
      if (auto job = makeJob(recording, ticket)) jobs.push_back(std::move(job));
      continue;
    }
    // Without its document the movie stays in the journal. The next start tries again.
    if (!writeDocument(finishedFrom(recording))) continue;
    recording.forget();
    LMPLogMessage(context_->log_context(), kLogNotice,
                  "Recovered unfinished recording \"%s\" (duration: %ds); it was not submitted",
                  recording.path.c_str(), static_cast<int>(recording.duration));
  }
  return jobs;
}

}  // namespace lmx
