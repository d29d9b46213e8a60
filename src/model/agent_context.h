// The one shared record of the agent's settings and state.
#pragma once
#include <array>
#include <atomic>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "model/continuous_recording.h"
#include "model/recording_settings.h"
#include "model/timed_command_list.h"
#include "platform/log.h"
#include "platform/plist/property_list.h"
#include "support/dictionary.h"
#include "support/recursive_mutex.h"
#include "support/shared_value.h"
#include "support/time_value.h"

namespace lmx {

class AgentActions;
class AgentRecord;
class AgentSubmit;

/// Shared by the main thread, the channel threads, the capture thread and the post-process thread. Every
/// accessor is thread-safe: values are copied in and out. Texts that nobody has set are absent, which is not
/// the same as empty.
class AgentContext {
 public:
  using Text = std::optional<std::string>;
  using SharedPlist = std::shared_ptr<const PlistDictionary>;
  using SharedSecret = std::optional<std::array<unsigned char, 16>>;

  /// A new context with `record` as its session (newAgentContext in record/ makes both).
  template <class Record>
  explicit AgentContext(std::shared_ptr<Record> record) {
    setRecord_context(std::move(record));
    setContinuous(LMRContinuousRecordingInfo{});
  }
  /// Runs cleanup.
  ~AgentContext();
  AgentContext(const AgentContext&) = delete;
  AgentContext& operator=(const AgentContext&) = delete;

  // Plain numbers and flags.
  [[nodiscard]] bool running() const { return running_; }
  void setRunning(bool v) { running_ = v; }
  [[nodiscard]] bool adhoc() const { return adhoc_; }
  void setAdhoc(bool v) { adhoc_ = v; }
  [[nodiscard]] std::int32_t duration() const { return duration_; }
  void setDuration(std::int32_t v) { duration_ = v; }
  [[nodiscard]] std::int32_t unattended() const { return unattended_; }
  void setUnattended(std::int32_t v) { unattended_ = v; }
  [[nodiscard]] std::int32_t adhoc_request_type() const { return adhoc_request_type_; }
  void setAdhoc_request_type(std::int32_t v) { adhoc_request_type_ = v; }
  [[nodiscard]] std::int64_t last_device_check() const { return last_device_check_; }
  void setLast_device_check(std::int64_t v) { last_device_check_ = v; }
  [[nodiscard]] bool agent_sent_or_fail() const { return agent_sent_or_fail_; }
  void setAgent_sent_or_fail(bool v) { agent_sent_or_fail_ = v; }
  [[nodiscard]] std::int32_t timeshift_seconds() const { return timeshift_seconds_; }
  void setTimeshift_seconds(std::int32_t v) { timeshift_seconds_ = v; }
  /// Network byte order; 0 means no direct TCP channel.
  [[nodiscard]] std::uint16_t tcp_listener_port() const { return tcp_listener_port_; }
  void setTcp_listener_port(std::uint16_t v) { tcp_listener_port_ = v; }
  /// Result of the last capture action: 0, else the recording engine's result.
  [[nodiscard]] std::int32_t status() const { return status_; }
  void setStatus(std::int32_t v) { status_ = v; }
  [[nodiscard]] bool submit_disabled() const { return submit_disabled_; }
  void setSubmit_disabled(bool v) { submit_disabled_ = v; }
  /// Seconds since 1970 at which the server last refused the agent; 0 when it has not.
  [[nodiscard]] std::int64_t serverRejectTime() const { return serverRejectTime_; }
  void setServerRejectTime(std::int64_t v) { serverRejectTime_ = v; }
  /// Null before the logging set-up and after cleanup; messages then go to the default context.
  [[nodiscard]] LMPLogContext log_context() const { return log_context_; }
  void setLog_context(LMPLogContext v) { log_context_ = v; }

  LMX_SHARED_FIELD(std::optional<TimeValue>, launch_time, setLaunch_time)
  LMX_SHARED_FIELD(Text, adhoc_output_file, setAdhoc_output_file)
  LMX_SHARED_FIELD(Text, input_file, setInput_file)
  LMX_SHARED_FIELD(Text, preview_file, setPreview_file)
  LMX_SHARED_FIELD(Text, start_timer, setStart_timer)
  LMX_SHARED_FIELD(Text, timer_id, setTimer_id)
  LMX_SHARED_FIELD(Text, user, setUser)
  LMX_SHARED_FIELD(Text, password, setPassword)
  LMX_SHARED_FIELD(Text, machine_name, setMachine_name)
  LMX_SHARED_FIELD(Text, machine_uuid, setMachine_uuid)
  LMX_SHARED_FIELD(Text, server_uuid, setServer_uuid)
  LMX_SHARED_FIELD(SharedSecret, shared_secret, setShared_secret)
  LMX_SHARED_FIELD(Text, lumex_url, setLumex_url)
  LMX_SHARED_FIELD(Text, tunnel_host, setTunnel_host)
  LMX_SHARED_FIELD(Text, tunnel_port, setTunnel_port)
  LMX_SHARED_FIELD(Text, recording_repository_path, setRecording_repository_path)
  LMX_SHARED_FIELD(Text, recording_type, setRecording_type)
  LMX_SHARED_FIELD(Text, preview_directory, setPreview_directory)
  /// Absent only after cleanup.
  LMX_SHARED_FIELD(std::optional<LMRContinuousRecordingInfo>, continuous, setContinuous)
  LMX_SHARED_FIELD(Text, capture_preset, setCapture_preset)
  LMX_SHARED_FIELD(Text, recording_audio_channel, setRecording_audio_channel)
  LMX_SHARED_FIELD(Text, recording_audio_input, setRecording_audio_input)
  LMX_SHARED_FIELD(Text, recording_audio_sample_rate, setRecording_audio_sample_rate)
  LMX_SHARED_FIELD(Text, recording_video_maximum_frame_rate, setRecording_video_maximum_frame_rate)
  /// The parameters of the last START.
  LMX_SHARED_FIELD(SharedDictionary, properties, setProperties)

 public:
  /// The recording session; null only after cleanup.
  [[nodiscard]] std::shared_ptr<AgentRecord> record_context() const { return record_context_.get(); }
  /// The session's face towards the preferences.
  [[nodiscard]] std::shared_ptr<RecordingSettings> recording_settings() const {
    return recording_settings_.get();
  }
  template <class Record>
  void setRecord_context(std::shared_ptr<Record> record) {
    recording_settings_.set(record);
    record_context_.set(std::move(record));
  }
  void setRecord_context(std::nullptr_t) {
    recording_settings_.set(nullptr);
    record_context_.set(nullptr);
  }

  void logDebug(const std::string& message) const;
  void logInfo(const std::string& message) const;
  void logWarn(const std::string& message) const;

  /// Appends `job` to the post-process list.
  void postProcessListAddJob(std::shared_ptr<AgentSubmit> job);
  /// Takes the oldest job off the list; null when it is empty.
  std::shared_ptr<AgentSubmit> postProcessListNext();
  std::size_t postProcessListCount();

  /// The commands that wait for their time.
  [[nodiscard]] TimedCommandList& timedCmdList() { return timedCmdList_; }

  void setServer_info(SharedPlist info);
  /// The current cluster information; null when none is stored. The caller's copy keeps it alive.
  [[nodiscard]] SharedPlist server_info_retain();

  // The pthread result, 0 on success.
  int lock_server_info_mutex() { return server_info_mutex_.lock(); }
  int unlock_server_info_mutex() { return server_info_mutex_.unlock(); }
  int lock_control_action_mutex() { return control_action_mutex_.lock(); }
  int unlock_control_action_mutex() { return control_action_mutex_.unlock(); }
  int lock_post_process_list_mutex() { return post_process_list_mutex_.lock(); }
  int unlock_post_process_list_mutex() { return post_process_list_mutex_.unlock(); }

  /// Takes the context apart: `running` NO, session released, list emptied, log context closed. The objects
  /// that running threads can still reach (mutexes) live until the process ends. Runs once; later calls do
  /// nothing.
  void cleanup();
  /// What cleanup calls to release the server-tunnel channel (daemon mode) and to ask the post-process thread
  /// to end.
  void setCleanupHooks(std::function<void()> releaseTunnel, std::function<bool()> cancelPostProcess);

 private:
  std::atomic<bool> running_{false};
  std::atomic<bool> adhoc_{false};
  std::atomic<std::int32_t> duration_{240};
  std::atomic<std::int32_t> unattended_{60};
  std::atomic<std::int32_t> adhoc_request_type_{0};
  std::atomic<std::int64_t> last_device_check_{0};
  std::atomic<bool> agent_sent_or_fail_{false};
  std::atomic<std::int32_t> timeshift_seconds_{0};
  std::atomic<std::uint16_t> tcp_listener_port_{0};
  std::atomic<std::int32_t> status_{0};
  std::atomic<bool> submit_disabled_{false};
  std::atomic<std::int64_t> serverRejectTime_{0};
  std::atomic<LMPLogContext> log_context_{nullptr};
  std::atomic<bool> cleaned_up_{false};

  SharedValue<std::shared_ptr<AgentRecord>> record_context_;
  SharedValue<std::shared_ptr<RecordingSettings>> recording_settings_;

  TimedCommandList timedCmdList_;
  RecursiveMutex server_info_mutex_;
  SharedPlist server_info_;  // guarded by server_info_mutex_
  RecursiveMutex control_action_mutex_;
  RecursiveMutex post_process_list_mutex_;
  std::deque<std::shared_ptr<AgentSubmit>> post_process_list_;  // guarded by post_process_list_mutex_

  std::function<void()> release_tunnel_;
  std::function<bool()> cancel_post_process_;  // returns whether there was a thread
};

}  // namespace lmx
