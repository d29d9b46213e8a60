// A finished recording on its way to the server: its properties document and its submission.
#pragma once
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "model/agent_context.h"
#include "platform/child_process.h"
#include "postprocess/job_store.h"
#include "record/agent_record.h"
#include "support/dictionary.h"
#include "support/time_value.h"

namespace lmx {

/// Created by the stop callback, then owned by the post-process list, then by the scheduler thread: one
/// thread at a time.
class AgentSubmit {
 public:
  using Text = std::optional<std::string>;

  AgentSubmit() = default;
  AgentSubmit(const AgentSubmit&) = delete;
  AgentSubmit& operator=(const AgentSubmit&) = delete;

  Dictionary properties;
  std::shared_ptr<AgentContext> agentContext;
  /// The session that recorded (the job's own copy). Its type goes into the document and decides what is
  /// copied; the current session may have moved on to another type. Absent: the context's session is used.
  std::shared_ptr<AgentRecord> recorded;
  Text recording_file_path;
  Text properties_file_path;
  Text adhoc_workflow_uuid;
  // Who submits to the workflow; absent: whom the agent knows when the job runs.
  Text user;
  Text password;
  std::string request;                ///< identifies the request in the journal of its capture
  std::shared_ptr<StoredJob> stored;  ///< null: the job is only in memory
  bool canceled = false;

  /// Gathers everything for the properties document. A failure is logged and ends the gathering; what was
  /// gathered before is kept.
  /// @param duration  whole seconds of media
  void setPropertyValuesWithContext(std::shared_ptr<AgentContext> context, const Text& movie,
                                    std::optional<TimeValue> started_date,
                                    std::optional<TimeValue> stopped_date, std::int64_t duration,
                                    const SharedDictionary& user_properties, bool was_canceled);
  /// Writes the document beside the movie, atomically; does nothing without a path.
  /// @return false when it could not be written (logged)
  [[nodiscard]] bool tryWriteProperties() const;
  /// The same for a recording that goes on to the tool. Always returns 0: after a failed write the tool
  /// reports the missing document.
  int writeProperties();
  /// Whether the last writeProperties() wrote a document.
  [[nodiscard]] bool documented() const { return documented_; }

  /// Submits the recording and logs the progress. The job is over then, whatever the result.
  /// @return 0 when the job ended normally, -1 when the submission failed
  int addRecordingWithCommentary(ChildRunner& children);
  /// Runs the tool. @return 0 when it exited with 0, else 1 (logged)
  int addRecording(ChildRunner& children);

 private:
  int submitOrCleanUp(ChildRunner& children);
  [[nodiscard]] bool gather(const Text& movie, std::optional<TimeValue> started_date,
                            std::optional<TimeValue> stopped_date, std::int64_t duration);
  void copyInputFile(const std::string& uuid) const;
  void removeFiles() const;
  [[nodiscard]] std::shared_ptr<AgentRecord> session() const;
  [[nodiscard]] LMPLogContext log() const { return agentContext ? agentContext->log_context() : nullptr; }

  bool documented_ = false;
};

}  // namespace lmx
