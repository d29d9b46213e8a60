// Writes the properties document and stores the job.
#include "agent/job_maker.h"

#include "model/metadata_keys.h"
#include "platform/log.h"

namespace lmx {

bool JobMaker::wantsSubmission(const SharedDictionary& properties) const {
  return !context_->options.adhoc.get() && !context_->options.submit_disabled.get() &&
         lookUp(properties, metadata_key::kAdHocSubmitDisabled) != "1";
}

std::shared_ptr<AgentSubmit> JobMaker::make(const Finished& finished, const HandOffOrder::Ticket& ticket) {
  auto job = std::make_shared<AgentSubmit>();
  job->recorded = finished.record->copy();
  job->recorded->releaseCapture();  // a job may wait for days: it must not keep the capture's files open
  job->request = finished.request.uuid;
  job->user = finished.request.user;
  job->password = finished.request.password;
  job->adhoc_workflow_uuid = lookUp(finished.request.properties, metadata_key::kAdHocWorkflowUUID);
  job->setPropertyValuesWithContext(context_, finished.movie, finished.started, finished.stopped,
                                    finished.seconds, finished.metadata, finished.canceled);
  if (job->writeProperties() != 0) {
    LMPLogMessage(context_->log_context(), kLogCritical,
                  "Internal error occurred in did stop with success callback");
    context_->state.running.set(false);
    return nullptr;
  }
  store_.keep(*job, HandOffOrder::placeOf(ticket));
  return job;
}

}  // namespace lmx
