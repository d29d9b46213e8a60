// One finished recording on its way to the server: its properties document and its submission.
#pragma once
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "model/agent_context.h"
#include "platform/child_process.h"
#include "record/agent_record.h"
#include "support/dictionary.h"
#include "support/time_value.h"

namespace lmx {

/// Made by the stop callback, then owned by the post-process list, then by the scheduler thread: one thread
/// at a time.
class AgentSubmit {
 public:
  using Text = std::optional<std::string>;

  AgentSubmit() = default;
  ~AgentSubmit() { cleanup(); }
  AgentSubmit(const AgentSubmit&) = delete;
  AgentSubmit& operator=(const AgentSubmit&) = delete;

  [[nodiscard]] const Dictionary& properties() const { return properties_; }
  void setProperties(Dictionary v) { properties_ = std::move(v); }
  [[nodiscard]] const std::shared_ptr<AgentContext>& agentContext() const { return agentContext_; }
  void setAgentContext(std::shared_ptr<AgentContext> v) { agentContext_ = std::move(v); }
  [[nodiscard]] const Text& recording_file_path() const { return recording_file_path_; }
  void setRecording_file_path(Text v) { recording_file_path_ = std::move(v); }
  [[nodiscard]] const Text& properties_file_path() const { return properties_file_path_; }
  void setProperties_file_path(Text v) { properties_file_path_ = std::move(v); }
  [[nodiscard]] bool canceled() const { return canceled_; }
  void setCanceled(bool v) { canceled_ = v; }
  [[nodiscard]] const Text& adhoc_workflow_uuid() const { return adhoc_workflow_uuid_; }
  void setAdhoc_workflow_uuid(Text v) { adhoc_workflow_uuid_ = std::move(v); }
  /// The session that recorded (the job's copy): its type goes into the document and decides what is copied,
  /// since the current session may have gone on to another type. Absent: the context's session.
  void setRecord(std::shared_ptr<AgentRecord> v) { record_ = std::move(v); }

  [[nodiscard]] Text getProperty(const Text& name) const;
  /// false when either is absent or the name is already there: an existing value is never replaced.
  bool addValue(const Text& value, const Text& name);

  /// Gathers everything for the properties document. A failure is logged and ends the gathering; what is
  /// there stays.
  /// @param duration  whole seconds of media
  void setPropertyValuesWithContext(std::shared_ptr<AgentContext> context, const Text& recording_file_path,
                                    std::optional<TimeValue> started_date,
                                    std::optional<TimeValue> stopped_date, std::int64_t duration,
                                    const SharedDictionary& user_properties, bool canceled);
  /// The document's text: XML 1.0, UTF-8, one property an element.
  [[nodiscard]] std::string propertiesXml() const;
  /// Writes the document beside the movie, atomically; nothing without a path. @return false when it could
  /// not be written, which is logged
  [[nodiscard]] bool tryWriteProperties() const;
  /// The same for a recording that goes on to the tool. Always 0: a failed write is left to the tool to
  /// complain of.
  int writeProperties();
  /// Whether the last writeProperties() has left a document behind.
  [[nodiscard]] bool documented() const { return documented_; }

  /// The submission with its log lines. @return 0 when the job ended normally, -1 when the submission failed.
  int addRecordingWithCommentary(ChildRunner& children);
  /// Runs the tool. @return 0 when it exited with 0, else 1 (logged).
  int addRecording(ChildRunner& children);

  void cleanup();

 private:
  [[nodiscard]] std::shared_ptr<AgentRecord> record() const;
  static int runTool(ChildRunner& children, const std::vector<std::string>& arguments);

  Dictionary properties_;
  std::shared_ptr<AgentContext> agentContext_;
  std::shared_ptr<AgentRecord> record_;
  Text recording_file_path_;
  Text properties_file_path_;
  bool canceled_ = false;
  bool documented_ = false;
  Text adhoc_workflow_uuid_;
};

}  // namespace lmx
