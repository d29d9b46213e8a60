// The one shared record of the agent's settings and state, put together from its parts.
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

/// Shared by the main thread, the channel threads, the capture thread and the post-process thread: every part
/// is thread-safe. Give a class the part that it needs rather than the whole. It lives until the process
/// ends.
class AgentContext : public AgentLog {
 public:
  using Text = std::optional<std::string>;
  using SharedPlist = std::shared_ptr<const PlistDictionary>;

  /// A new context with `record` as its session (newAgentContext in record/ makes both).
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
  /// Serialises the actions of the recording engine.
  RecursiveMutex control_action_mutex;

  /// The recording session; null only after cleanup.
  [[nodiscard]] std::shared_ptr<AgentRecord> record_context() const { return record_context_.get(); }
  /// The session's face towards the preferences.
  [[nodiscard]] std::shared_ptr<RecordingSettings> recording_settings() const {
    return recording_settings_.get();
  }
  /// Lets go of the session.
  void releaseRecord();

  /// Takes the context apart: `running` NO, session released, list emptied, log context closed. Runs once;
  /// later calls do nothing. The process ends without it, since threads that nobody joins may still use the
  /// context.
  void cleanup();

 private:
  SharedValue<std::shared_ptr<AgentRecord>> record_context_;
  SharedValue<std::shared_ptr<RecordingSettings>> recording_settings_;
  SharedValue<bool> cleaned_up_;
};

}  // namespace lmx
