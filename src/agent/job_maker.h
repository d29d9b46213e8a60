// Makes the job of a finished recording: its properties document and its place in the store.
#pragma once
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "agent/hand_off_order.h"
#include "model/agent_context.h"
#include "model/recording_request.h"
#include "platform/paths.h"
#include "postprocess/agent_submit.h"
#include "postprocess/job_store.h"
#include "record/agent_record.h"
#include "support/dictionary.h"
#include "support/time_value.h"

namespace lmx {

/// Thread-safe.
class JobMaker {
 public:
  explicit JobMaker(std::shared_ptr<AgentContext> context) : context_(std::move(context)) {}

  /// A recording whose movie is in place.
  struct Finished {
    std::shared_ptr<AgentRecord> record;  ///< its type is read; the capture objects in it are released
    RecordingRequest request;
    std::string movie;
    SharedDictionary metadata;  ///< goes into the document
    std::optional<TimeValue> started;
    std::optional<TimeValue> stopped;
    std::int64_t seconds = 0;  ///< of media
    bool canceled = false;
  };

  /// Whether a recording with these parameters goes to the server.
  [[nodiscard]] bool wantsSubmission(const SharedDictionary& properties) const;
  /// Writes the document (AgentSubmit::documented() tells whether it could be) and stores the job, in this
  /// order. @return null when it could not be made: the agent then ends (logged)
  [[nodiscard]] std::shared_ptr<AgentSubmit> make(const Finished& finished,
                                                  const HandOffOrder::Ticket& ticket);
  [[nodiscard]] JobStore& store() { return store_; }

 private:
  const std::shared_ptr<AgentContext> context_;
  JobStore store_{systemPath(kJobsDirectory)};
};

}  // namespace lmx
