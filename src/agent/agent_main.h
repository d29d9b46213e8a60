// The agent: assembles its parts, starts the daemon and ends it.
#pragma once
#include <cstdint>
#include <ctime>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "agent/agent_environment.h"
#include "agent/capture_actions.h"
#include "agent/channels.h"
#include "agent/cluster_watch.h"
#include "agent/device_watch.h"
#include "agent/disk_space_guard.h"
#include "agent/main_loop.h"
#include "agent/submission.h"
#include "agent/timed_command_runner.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "platform/run_loop.h"
#include "platform/signals.h"
#include "postprocess/scheduler.h"
#include "prefs/agent_preferences.h"

namespace lmx {

/// One per process, created by the main thread and never destroyed while other threads run. "Main thread" is
/// the thread that created it. Actions are forwarded to the part that implements them.
class AgentMain final : public AgentActions {
 public:
  AgentMain(std::shared_ptr<AgentContext> context, AgentEnvironment environment);
  ~AgentMain() override;

  /// Runs the daemon until it ends. @return the exit status of the process
  int startupDaemon();
  /// @return false when no log can be opened (reported on standard error)
  bool setupLoggingContext();
  void setupSignalHandlers();
  /// Starts the disk-space and cluster timers, and runs each once immediately.
  void startTimers();
  /// Handles a signal. Main thread.
  void signal(int number);

  [[nodiscard]] const std::shared_ptr<AgentContext>& agentContext() const { return context_; }
  [[nodiscard]] const AgentEnvironment& environment() const { return environment_; }
  // The parts, for the code that assembles the process and for tests.
  [[nodiscard]] RunLoop& mainRunLoop() { return loop_; }
  [[nodiscard]] MainLoop& mainLoop() { return main_loop_; }
  [[nodiscard]] DeviceWatch& devices() { return devices_; }
  [[nodiscard]] DiskSpaceGuard& diskSpaceGuard() { return disk_space_guard_; }
  [[nodiscard]] TimedCommandRunner& timedCommands() { return timed_commands_; }
  [[nodiscard]] Submission& submission() { return submission_; }

  bool perform(Action action, Wait wait) override;
  bool performFor(const std::string& request, Action action, Wait wait) override;
  int performStart(const SharedDictionary& properties) override;
  [[nodiscard]] bool isMainThread() const override { return loop_.isOwnerThread(); }
  void prepareCapture() override { capture_.prepareCapture(); }
  void startPreview() override { capture_.startPreview(); }
  void stopPreview() override { capture_.stopPreview(); }
  void pauseCapture() override { capture_.pauseCapture(); }
  void resumeCapture() override { capture_.resumeCapture(); }
  void stopCapture() override { capture_.stopCapture(); }
  void cancelCapture() override { capture_.cancelCapture(); }
  void cancelRecording() override { capture_.cancelRecording(); }
  void stopRecording() override { capture_.stopRecording(); }
  void setRecorderStatusToIdle() override { capture_.setRecorderStatusToIdle(); }
  void submitStoppedRecording() override { submission_.submitStoppedRecording(); }
  void shutDownControl() override;
  void shutDownControlBecauseDeviceFailed() override;
  void scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel) override;
  [[nodiscard]] std::unique_ptr<RunLoop::Source> watchNetwork(std::function<void()> changed) override;
  void captureDidComplete(const void* controller) override { submission_.captureDidComplete(controller); }
  void captureDidCancel(const void* controller) override { submission_.captureDidCancel(controller); }
  void recordDidStartWithFile(const std::string& file, const SharedDictionary& metadata,
                              std::optional<TimeValue> atTime) override;
  void recordDidPauseWithFile(const std::string& file, const SharedDictionary& metadata,
                              std::int64_t elapsedSeconds) override;
  void recordDidResumeWithFile(const std::string& file, const SharedDictionary& metadata) override;
  void recordRuntimeErrorCallback(int code) override { capture_.recordRuntimeErrorCallback(code); }
  void recordDidStopWithFile(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                             const SharedDictionary& metadata, std::optional<TimeValue> atTime,
                             std::int64_t elapsedSeconds, std::optional<TimeValue> stoppedTime,
                             bool canceled) override;

 private:
  // Steps of startupDaemon, in order.
  enum class Start { ok, askedToEnd, fatal, fatalAndDisable };
  Start loadSettings();
  Start prepareGround();
  Start startServices();
  void startListeners();
  void shutdown();
  int stopSequence(Start result, ProcessEnd end);

  const std::shared_ptr<AgentContext> context_;
  const AgentEnvironment environment_;
  RunLoop loop_;
  std::unique_ptr<SignalSource> signals_;
  std::shared_ptr<LMRRecordingContext> start_settings_;  ///< capture settings used until the services run
  std::unique_ptr<AgentPreferences> agentPrefs_;
  PostProcessScheduler scheduler_;
  Submission submission_;
  CaptureActions capture_;
  Channels channels_;
  TimedCommandRunner timed_commands_;
  DeviceWatch devices_;
  DiskSpaceGuard disk_space_guard_;
  ClusterWatch cluster_;
  MainLoop main_loop_;
  std::unique_ptr<RunLoop::Source> clusterInfoTimer_;
  std::unique_ptr<RunLoop::Source> diskSpaceTimer_;
};

}  // namespace lmx
