// The agent itself: life of the daemon, its main loop, the actions of the main thread, the way of a finished
// recording.
#pragma once
#include <sys/types.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <ctime>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "agent/schedule.h"
#include "capture/api/capture_framework.h"
#include "control/channel/detached_channel.h"
#include "control/local/agent_control_unix.h"
#include "control/local/client_connect.h"
#include "control/tunnel/agent_control.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "platform/child_process.h"
#include "platform/run_loop.h"
#include "platform/service_manager.h"
#include "platform/signals.h"
#include "postprocess/scheduler.h"
#include "prefs/agent_preferences.h"
#include "record/agent_record.h"

namespace lmx {

inline constexpr double kVersion = 100;
/// What the service manager knows the agent as.
inline constexpr const char* kServiceJob = "com.zandor.lmxagentd";

/// What the agent is given from outside; scripted in tests.
struct AgentEnvironment {
  std::shared_ptr<CaptureFramework> framework;
  std::shared_ptr<ServiceManager> serviceManager;
  ChildRunner* children = nullptr;  ///< lives until the process ends
};

/// One a process, made by the main thread and never destroyed while other threads run. "Main thread" below is
/// the one that made it.
class AgentMain : public AgentActions {
 public:
  AgentMain(std::shared_ptr<AgentContext> context, AgentEnvironment environment);
  ~AgentMain() override;

  [[nodiscard]] const std::shared_ptr<AgentContext>& agentContext() const { return context_; }

  // ---- command line (command_line.cpp)
  /// Reads the options into the context. @return YES when the program is to go on to startup; NO when it is
  /// to exit with `*exitCode`.
  /// Its messages go to standard error.
  bool parseArgs(char* const* argv, int count, int* exitCode);
  static void usageForTool(const std::string& tool);
  static std::string toolNameFromPathArg(const char* argument);

  // ---- life of the daemon (daemon.cpp, daemon_files.cpp, disk_space_guard.cpp, schedule.cpp,
  // service_disable.cpp)
  /// Runs the agent to its end. @return the exit status of the process.
  int startup();
  int startupDaemon();
  bool setupLoggingContext();
  void setupSignalHandlers();
  void shutdown();
  /// @return 0, or 1 when the file can't be made (access denied is only logged).
  int createPIDFile();
  void removePIDFile();
  /// True when the directory exists afterwards.
  bool setupRecordingRepository();
  /// The disk-space timer and the schedule; each is acted on once at once.
  void startTimers();
  /// Stops recording when the movie's volume runs full, and in continuous mode starts it again. Main thread.
  void checkDiskSpace();
  /// Schedules what an earlier process left in the timers file. Main thread.
  void loadSchedule();
  /// Has the service manager never start this agent again, and ends the process: 78, or 71 when that failed.
  [[noreturn]] void disableService();

  // ---- the server's cluster (cluster.cpp)
  using SharedPlist = AgentContext::SharedPlist;
  /// Asks `host`, else one of the cached members. Blocks while the tool runs, half a minute at most.
  /// @param members  gets the member dictionary, null when there is none
  /// @return 0, -1 when there was nobody to ask, else the tool's exit status
  int clusterInformation(const std::optional<std::string>& host, SharedPlist& members) const;
  /// @param limit  the tool is killed after that time
  int clusterInformationFromSpecificHostOnly(const std::string& host, SharedPlist& members,
                                             std::chrono::milliseconds limit) const;
  /// Tries the entry at `index`. @return as clusterInformation
  int clusterInformationWithMember(std::size_t index, const std::vector<std::string>& hosts,
                                   SharedPlist& members, std::chrono::milliseconds limit) const;
  /// The member dictionary that the tool has left on the disk, or null.
  static SharedPlist clusterInformationFromDisk();
  /// Asks again in the background and stores the answer; a failure keeps the old one.
  void refreshClusterInformation();

  // ---- ad-hoc mode (adhoc.cpp)
  /// One command to the running daemon; a recording lasts until an interrupt. @return the exit status
  int startupAdHoc();
  /// Until the process is told to end or a capture of its own loses its device. @return 0
  int appLoopAdHoc();

  // ---- main loop (main_loop.cpp)
  /// @return 0 for an orderly end, 1 when the capture device was lost.
  int appLoop();
  void signal(int number);
  /// Whether the loop must end because the capture device is gone.
  bool deviceDisconnected();
  std::shared_ptr<LMRRecordingContext> recordingContext();

  // ---- AgentActions (capture_actions.cpp, submission.cpp)
  bool perform(Action action, Wait wait) override;
  void prepareCapture() override;
  void startPreview() override;
  void stopPreview() override;
  void pauseCapture() override;
  void resumeCapture() override;
  void stopCapture() override;
  void cancelCapture() override;
  void stopRecording() override;
  void setRecorderStatusToIdle() override;
  void shutDownControl() override;
  void shutDownControlBecauseDeviceFailed() override;
  void submitStoppedRecording() override;
  void scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel) override;
  [[nodiscard]] std::unique_ptr<RunLoop::Source> watchNetwork(std::function<void()> changed) override;
  void captureDidComplete(const void* controller) override;
  void captureDidCancel(const void* controller) override;
  void recordDidStartWithFile(const std::string& file, const SharedDictionary& metadata,
                              std::optional<TimeValue> atTime) override;
  void recordDidPauseWithFile(const std::string& file, const SharedDictionary& metadata,
                              std::int64_t elapsedSeconds) override;
  void recordDidResumeWithFile(const std::string& file, const SharedDictionary& metadata) override;
  void recordRuntimeErrorCallback(int code) override;
  void recordDidStopWithFile(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                             const SharedDictionary& metadata, std::optional<TimeValue> atTime,
                             std::int64_t elapsedSeconds, std::optional<TimeValue> stoppedTime,
                             bool canceled) override;

  /// What recordDidStopWithFile does. @return false when the recording should have a document and has none
  bool announceStop(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                    const SharedDictionary& metadata, std::optional<TimeValue> atTime,
                    std::int64_t elapsedSeconds, std::optional<TimeValue> stoppedTime, bool canceled);

  /// Puts recovered movies' documents beside them and logs one line each; nothing is submitted. Any thread.
  void keepRecovered(const std::vector<RecoveredRecording>& recordings);

  [[nodiscard]] RunLoop& mainRunLoop() { return loop_; }
  [[nodiscard]] bool runLoopRunning() const { return runLoopRunning_; }

 private:
  // Steps of parseArgs.
  struct ToolRequest;
  bool readOptions(char* const* argv, int count, int& exitCode);
  /// An option that ends the reading. @return the exit code
  int stopAtOption(int option, const std::string& tool);
  /// @return whether it was one of these (and could be taken)
  bool takeToolOption(int option, ToolRequest& request);
  bool takeAdHocOption(int option);
  [[nodiscard]] bool combinationAllowed(const ToolRequest& request) const;
  int runTools(const ToolRequest& request);

  // Steps of startupDaemon, in order.
  enum class Start { ok, fatal, fatalAndDisable };
  Start loadSettings();
  Start prepareGround();
  void probeDevice(const LMRRecordingContext& settings);
  Start startServices();
  void learnCluster();

  // The tunnel (tunnel.cpp). Main thread.
  bool openTunnel();
  void closeTunnel();
  /// Leaves word with a server that understands it: a last hello that says offline. Ten seconds at most.
  void tellServerOfTheEnd();
  int stopSequence(Start result, int status);

  int recordAdHoc(ClientConnect& client);
  /// Acts on the signals that have come. @return whether the process is to go on
  bool handleSignals();

  // Steps of a turn of the main loop.
  void runDueCommands(std::time_t now);
  [[nodiscard]] std::chrono::milliseconds timeToNextCommand(std::chrono::milliseconds atMost) const;
  [[nodiscard]] AgentControlBase& channelOf(ChannelKind kind);
  void retryDevice(std::int64_t now);
  void stopForgottenPreview(std::int64_t now);
  void readTimeShift();
  void reloadChangedPreferences();
  void checkServerRefusal(std::int64_t now);

  void recordAgainWithSpace(std::uint64_t megabytes);
  void stopForLackOfSpace(std::uint64_t megabytes, std::uint32_t wanted);
  void pauseOrResume(bool pause);
  void stopOrCancelCapture(bool cancel);
  void rememberStopped(const std::shared_ptr<LMRCaptureController>& controller);
  std::shared_ptr<AgentRecord> takeStopped(const void* controller);
  void submit(const std::shared_ptr<AgentRecord>& stopped);
  void handOff(const std::shared_ptr<AgentRecord>& stopped, const std::string& path, double elapsed);
  void recoverUnfinishedRecordings();
  [[nodiscard]] std::shared_ptr<AgentRecord> session() const { return context_->record_context(); }
  [[nodiscard]] std::shared_ptr<LMRCaptureController> captureController() const;
  [[nodiscard]] bool postProcessingIsIdle() const;

  const std::shared_ptr<AgentContext> context_;
  const AgentEnvironment environment_;
  RunLoop loop_;
  bool runLoopRunning_ = false;
  bool shouldDisplayOfflineMessage_ = false;
  bool device_offline_ = false;
  std::unique_ptr<SignalSource> signals_;
  std::shared_ptr<LMRRecordingContext> start_settings_;
  std::unique_ptr<AgentPreferences> agentPrefs_;
  PostProcessScheduler scheduler_;
  std::unique_ptr<AgentControl> agentControl_;  ///< null while the camera is away
  std::unique_ptr<AgentControlUnix> agentControlLocal_;
  std::atomic<bool> cluster_refresh_{false};
  std::unique_ptr<RunLoop::Source> clusterInfoTimer_;
  Schedule schedule_;
  DetachedChannel detached_;
  std::unique_ptr<RunLoop::Source> diskSpaceTimer_;
  bool shouldDisplayNoDiskSpaceMessage_ = false;
  /// Sessions as they were when their capture was stopped or cancelled, until the capture reports: by then
  /// the session may have gone on to the next recording. Main thread.
  std::map<const void*, std::shared_ptr<AgentRecord>> stopped_;
  /// The last capture whose report has been dealt with: nothing more is to be expected of it. Main thread.
  std::weak_ptr<LMRCaptureController> reported_;
  /// Captures that have ended and whose job is not in the list yet.
  std::atomic<int> hand_offs_{0};
};

}  // namespace lmx
