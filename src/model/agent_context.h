// The agent's shared settings and state, assembled from their parts.
#pragma once
#include <cstddef>
#include <memory>
#include <optional>
#include <string>

#include "model/agent_log.h"
#include "model/agent_settings.h"
#include "model/agent_state.h"
#include "model/post_process_list.h"
#include "model/recording_settings.h"
#include "model/run_options.h"
#include "model/timed_command_list.h"
#include "platform/plist/property_list.h"
#include "support/recursive_mutex.h"
#include "support/shared_value.h"

namespace lmx {

class AgentRecord;

/// Shared by the main thread, the channel threads, the capture thread and the post-process thread. Every part
/// is thread-safe. Pass a class the part that it needs rather than the whole. Lives until the process ends.
class AgentContext : public AgentLog {
 public:
  using Text = std::optional<std::string>;
  using SharedPlist = std::shared_ptr<const PlistDictionary>;

  /// Creates a context with `record` as its session (newAgentContext in record/ creates both).
  template <class Record>
  explicit AgentContext(std::shared_ptr<Record> record)
      : record_context_(record), recording_settings_(record) {}
  /// Runs cleanup.
  ~AgentContext();
  AgentContext(const AgentContext&) = delete;
  AgentContext& operator=(const AgentContext&) = delete;

  RunOptions options;
  ServerSettings server;
  RecordingDefaults recording;
  AgentState state;
  /// The members of the server's cluster; null when none are known.
  SharedValue<SharedPlist> server_info;
  TimedCommandList timedCmdList;
  PostProcessList post_process_list;
  /// Serialises the recording engine's actions.
  RecursiveMutex control_action_mutex;

  /// The recording session; null only after cleanup.
  [[nodiscard]] std::shared_ptr<AgentRecord> record_context() const { return record_context_.get(); }
  /// The part of the session that the preferences set.
  [[nodiscard]] std::shared_ptr<RecordingSettings> recording_settings() const {
    return recording_settings_.get();
  }
  /// Releases the session.
  void releaseRecord();

  /// Takes the context apart: `running` becomes NO, the session is released, the list emptied and the log
  /// context closed. Takes effect once; later calls do nothing. The process exits without calling it, since
  /// threads that are never joined may still use the context.
  void cleanup();

 private:
  SharedValue<std::shared_ptr<AgentRecord>> record_context_;
  SharedValue<std::shared_ptr<RecordingSettings>> recording_settings_;
  SharedValue<bool> cleaned_up_;
};

}  // namespace lmx
