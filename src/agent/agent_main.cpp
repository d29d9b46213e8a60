// Starts the daemon and shuts it down.
#include "agent/agent_main.h"

#include <syslog.h>

#include <chrono>
#include <csignal>
#include <cstdio>
#include <ctime>
#include <utility>
#include <vector>

#include "agent/pid_file.h"
#include "agent/recording_repository.h"
#include "agent/service_disable.h"
#include "model/codes.h"
#include "platform/log.h"
#include "platform/network_watcher.h"
#include "platform/notifications.h"
#include "platform/paths.h"
#include "platform/work_queue.h"
#include "prefs/agent_settings.h"
#include "record/engine_environment.h"

namespace lmx {

using namespace std::chrono_literals;

AgentMain::AgentMain(std::shared_ptr<AgentContext> context, AgentEnvironment environment)
    : context_(std::move(context)),
      environment_(std::move(environment)),
      submission_(context_, *this, loop_, scheduler_),
      capture_(*context_, submission_),
      channels_(context_, *this, loop_),
      timed_commands_(*context_, channels_, loop_),
      devices_(context_, environment_.framework, submission_,
               [this] {
                 if (!channels_.tunnel().openTunnel()) return false;
                 timed_commands_.loadSchedule();
                 return true;
               }),
      disk_space_guard_(*context_, capture_),
      cluster_(*context_, context_->server, context_->server_info, *environment_.children),
      main_loop_({*context_, loop_, capture_, devices_, timed_commands_, submission_,
                  environment_.serviceManager.get()}) {
  loop_.adoptThread();
  setEngineEnvironment({context_, this, environment_.framework});
}

AgentMain::~AgentMain() {
  channels_.close();  // their threads use the other parts
  scheduler_.cancel();
  setEngineEnvironment({});
}

bool AgentMain::setupLoggingContext() {
  LMPLogContext log = LMPLogCreateContext("lmxagentd", "com.zandor.lumex");
  context_->open(log);
  if (log != nullptr) return true;
  syslog(LOG_ALERT, "LMPLogCreateContext failed, ZSL uninitialized.");
  std::fputs("LMPLogCreateContext failed, ZSL uninitialized.\n", stderr);
  return false;
}

void AgentMain::setupSignalHandlers() {
  signals_ = std::make_unique<SignalSource>(
      loop_, std::vector<int>{SIGHUP, SIGINT, SIGPIPE, SIGTERM, SIGUSR1, SIGUSR2},
      [this](int number) { signal(number); });
}

int AgentMain::startupDaemon() {
  if (!setupLoggingContext()) return stopSequence(Start::fatal, ProcessEnd::internalError);
  setupSignalHandlers();
  LMPLogMessage(context_->log_context(), kLogInfo, "lmxagentd (version %.0f) starting...", kVersion);
  Start result = loadSettings();
  if (result == Start::ok) result = prepareGround();
  if (result == Start::ok) result = startServices();
  if (result == Start::askedToEnd) return stopSequence(result, ProcessEnd::orderly);
  if (result != Start::ok) return stopSequence(result, ProcessEnd::internalError);
  startTimers();
  if (main_loop_.appLoop() == 1) return stopSequence(Start::fatal, ProcessEnd::internalError);
  return stopSequence(Start::ok, ProcessEnd::orderly);
}

AgentMain::Start AgentMain::loadSettings() {
  context_->recording.preview_directory.set(std::string(kStateDirectory));
  // The reason may be over when the service manager starts the agent again, so the service is not disabled.
  if (AgentPreferences().whyUnreadable()) return Start::fatal;
  start_settings_ = devices_.recordingContext();
  if (!start_settings_) return Start::fatalAndDisable;
  agentPrefs_ = std::make_unique<AgentPreferences>();
  main_loop_.watchPreferences(*agentPrefs_);
  return setAgentPreferencesInContext(*agentPrefs_, *context_) ? Start::ok : Start::fatalAndDisable;
}

AgentMain::Start AgentMain::prepareGround() {
  const std::string repository = context_->recording.recording_repository_path.get().value_or("");
  if (!setupRecordingRepository(*context_, repository) || createPIDFile(*context_) != 0) return Start::fatal;
  const auto camera = devices_.openAhead(*start_settings_);  // opens while the rest of the ground is prepared
  submission_.takeUpUnfinished(environment_.framework);
  if (!cluster_.learnCluster(loop_, [this] { return context_->state.running.get(); }))
    return Start::askedToEnd;
  devices_.probeDevice(*start_settings_, camera);
  return Start::ok;
}

AgentMain::Start AgentMain::startServices() {
  if (!scheduler_.start(context_, *environment_.children)) {
    LMPLogMessage(context_->log_context(), kLogCritical,
                  "Internal error occurred creating post-process scheduler thread");
    return Start::fatal;
  }
  // Before any channel: a TIMEDCMD writes the list, which would not hold the commands of the file yet.
  timed_commands_.loadSchedule();
  if (!devices_.deviceIsOffline() && !channels_.tunnel().openTunnel()) return Start::fatal;
  startListeners();
  // On a worker, so that start-up isn't delayed and the first recording finds the plug-ins loaded.
  dispatchAsync([framework = environment_.framework] { framework->warmUp(); });
  notify_post("com.zandor.lmxagentd.started");
  postDistributedNotification("com.zandor.lmxagentd.started");
  start_settings_ = nullptr;
  return Start::ok;
}

void AgentMain::startListeners() {
  if (!channels_.openLocal()) {
    LMPLogMessage(context_->log_context(), kLogAlert, "Unable to start listener on named pipe");
  }
  if (context_->server.tcp_listener_port.get() != 0) {
    LMPLogMessage(context_->log_context(), kLogAlert, "Unable to start TCP listener");
  }
}

int AgentMain::stopSequence(Start result, ProcessEnd end) {
  if (end == ProcessEnd::internalError) {
    LMPLogMessage(context_->log_context(), kLogCritical, "Internal error caused application to stop");
  }
  LMPLogMessage(context_->log_context(), kLogInfo, "lmxagentd is stopping...");
  shutdown();
  removePIDFile();
  if (result == Start::fatalAndDisable) disableService(*environment_.serviceManager);
  return exitStatus(end);
}

void AgentMain::startTimers() {
  clusterInfoTimer_ = loop_.addRepeatingTimer(180s, [this] { cluster_.refreshClusterInformation(); });
  cluster_.refreshClusterInformation();
  diskSpaceTimer_ = loop_.addRepeatingTimer(15s, [this] {
    disk_space_guard_.checkDiskSpace();
    submission_.letOverduePass();
  });
  disk_space_guard_.checkDiskSpace();
}

void AgentMain::shutdown() {
  clusterInfoTimer_ = nullptr;
  diskSpaceTimer_ = nullptr;
  context_->state.running.set(false);
  cluster_.stop(loop_);
  const auto controller = capture_.captureController();
  while (controller && !controller->hasShutDown()) loop_.run(250ms);
  if (environment_.framework) environment_.framework->waitUntilClosed(1s);
  channels_.tunnel().tellServerOfTheEnd();
  scheduler_.cancel();
  loop_.stop();
}

void AgentMain::signal(int number) {
  switch (number) {
    case SIGHUP:
      context_->logDebug("Got Signal (SIGHUP)");
      shutDownControl();
      break;
    case SIGINT:
      context_->logDebug("Got Stop Signal (SIGINT)");
      context_->state.running.set(false);
      if (!context_->options.adhoc.get()) stopCapture();
      break;
    case SIGTERM:
      context_->logDebug("Got Termination Signal (SIGTERM)");
      context_->state.running.set(false);  // first: nobody has asked for the submission of what runs
      stopCapture();
      break;
    case SIGUSR1:
      context_->logDebug("Got Pause Signal");
      capture_.pauseOrResume(true);
      break;
    case SIGUSR2:
      context_->logDebug("Got Resume Signal");
      capture_.pauseOrResume(false);
      break;
    default:  // SIGPIPE: a broken connection must not end the process
      break;
  }
}

bool AgentMain::perform(Action action, Wait wait) {
  return loop_.post([this, action] { (this->*action)(); }, wait);
}

bool AgentMain::performFor(const std::string& request, Action action, Wait wait) {
  return loop_.post(
      [this, request, action] {
        const auto record = context_->record_context();
        if (!record || record->request.get().uuid == request) return (this->*action)();
        context_->logDebug("A command for an earlier recording came too late");
      },
      wait);
}

int AgentMain::performStart(const SharedDictionary& properties) {
  int result = kRecordInvalidType;  // the main loop has ended: the peer must not take this for a recording
  loop_.post([&] { result = capture_.startRecording(properties); }, Wait::untilDone);
  return result;
}

void AgentMain::shutDownControl() {
  context_->logDebug("Process shutDownControl");
  cancelCapture();
  if (context_->options.adhoc.get()) return;
  channels_.tunnel().closeTunnel();
  context_->state.last_device_check.set(std::time(nullptr));
}

void AgentMain::shutDownControlBecauseDeviceFailed() {
  if (!context_->options.adhoc.get()) devices_.deviceFailed();
  shutDownControl();
}

void AgentMain::scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel) {
  timed_commands_.scheduleTimedCommand(std::move(entry), date, channel);
}

std::unique_ptr<RunLoop::Source> AgentMain::watchNetwork(std::function<void()> changed) {
  return lmx::watchNetwork(loop_, std::move(changed));
}

void AgentMain::recordDidStartWithFile(const std::string& file, const SharedDictionary& /*metadata*/,
                                       std::optional<TimeValue> /*atTime*/) {
  capture_.recordDidStartWithFile(file);
}

void AgentMain::recordDidPauseWithFile(const std::string& file, const SharedDictionary& /*metadata*/,
                                       std::int64_t elapsedSeconds) {
  capture_.recordDidPauseWithFile(file, elapsedSeconds);
}

void AgentMain::recordDidResumeWithFile(const std::string& file, const SharedDictionary& /*metadata*/) {
  capture_.recordDidResumeWithFile(file);
}

void AgentMain::recordDidStopWithFile(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                                      const SharedDictionary& metadata, std::optional<TimeValue> atTime,
                                      std::int64_t elapsedSeconds, std::optional<TimeValue> stoppedTime,
                                      bool canceled) {
  submission_.announceStop(session, file, metadata, atTime, elapsedSeconds, stoppedTime, canceled);
}

}  // namespace lmx
