// Start-up and shut-down of the daemon.
#include <syslog.h>

#include <csignal>
#include <cstdio>
#include <ctime>
#include <thread>

#include "agent/agent_main.h"
#include "platform/log.h"
#include "platform/notifications.h"
#include "platform/paths.h"
#include "platform/work_queue.h"
#include "prefs/agent_settings.h"
#include "record/create_preview.h"
#include "record/engine_environment.h"
#include "record/preview_controller.h"

namespace lmx {

using namespace std::chrono_literals;

AgentMain::AgentMain(std::shared_ptr<AgentContext> context, AgentEnvironment environment)
    : context_(std::move(context)), environment_(std::move(environment)), detached_(context_, this) {
  loop_.adoptThread();
  setEngineEnvironment({context_, this, environment_.framework});
}

AgentMain::~AgentMain() {
  while (cluster_refresh_) std::this_thread::sleep_for(1ms);  // it reaches this object until then
  agentControl_.reset();
  agentControlLocal_.reset();
  scheduler_.cancel();
  setEngineEnvironment({});
}

int AgentMain::startup() { return context_->options.adhoc.get() ? startupAdHoc() : startupDaemon(); }

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
      [this](int n) { signal(n); });
}

int AgentMain::startupDaemon() {
  if (!setupLoggingContext()) return stopSequence(Start::fatal, 1);
  setupSignalHandlers();
  LMPLogMessage(context_->log_context(), kLogInfo, "lmxagentd (version %.0f) starting...", kVersion);
  Start result = loadSettings();
  if (result == Start::ok) result = prepareGround();
  if (result == Start::ok) result = startServices();
  if (result != Start::ok) return stopSequence(result, 1);
  startTimers();
  if (appLoop() == 1) return stopSequence(Start::fatal, 1);
  return stopSequence(Start::ok, 0);
}

AgentMain::Start AgentMain::loadSettings() {
  context_->recording.preview_directory.set(std::string(kStateDirectory));
  start_settings_ = recordingContext();
  if (!start_settings_) return Start::fatalAndDisable;
  agentPrefs_ = std::make_unique<AgentPreferences>();
  return setAgentPreferencesInContext(*agentPrefs_, *context_) ? Start::ok : Start::fatalAndDisable;
}

AgentMain::Start AgentMain::prepareGround() {
  if (!setupRecordingRepository() || createPIDFile() != 0) return Start::fatal;
  recoverUnfinishedRecordings();
  learnCluster();
  probeDevice(*start_settings_);
  return Start::ok;
}

void AgentMain::probeDevice(const LMRRecordingContext& settings) {
  if (!settings.videoDeviceID) return;
  if (LXAgentRecordCreatePreviewController(settings.videoDeviceID, settings.audioDeviceID,
                                           settings.audioEnabled, settings.previewIntervalInMilliseconds,
                                           nullptr)) {
    return;
  }
  LMPLogMessage(
      context_->log_context(), kLogAlert,
      "Unable to acquire the specified video device. The agent will remain offline until the device becomes "
      "available.");
  context_->state.last_device_check.set(std::time(nullptr));
  device_offline_ = true;
}

AgentMain::Start AgentMain::startServices() {
  if (!scheduler_.start(context_, *environment_.children)) {
    LMPLogMessage(context_->log_context(), kLogCritical,
                  "Internal error occurred creating post-process scheduler thread");
    return Start::fatal;
  }
  if (!device_offline_ && !openTunnel()) return Start::fatal;
  agentControlLocal_ = newControlChannel<AgentControlUnix>(context_, this);
  if (!agentControlLocal_) {
    LMPLogMessage(context_->log_context(), kLogAlert, "Unable to start listener on named pipe");
  }
  if (context_->server.tcp_listener_port.get() != 0) {
    LMPLogMessage(context_->log_context(), kLogAlert, "Unable to start TCP listener");
  }
  // Off this thread: a first recording should find the plug-ins loaded, but nobody should wait for them now.
  dispatchAsync(WorkPriority::background, [framework = environment_.framework] { framework->warmUp(); });
  notify_post("com.zandor.lmxagentd.started");
  postDistributedNotification("com.zandor.lmxagentd.started");
  start_settings_ = nullptr;
  return Start::ok;
}

int AgentMain::stopSequence(Start result, int status) {
  if (status == 1)
    LMPLogMessage(context_->log_context(), kLogCritical, "Internal error caused application to stop");
  LMPLogMessage(context_->log_context(), kLogInfo, "lmxagentd is stopping...");
  shutdown();
  removePIDFile();
  if (result == Start::fatalAndDisable) disableService();
  return status;
}

void AgentMain::startTimers() {
  clusterInfoTimer_ = loop_.addRepeatingTimer(180s, [this] { refreshClusterInformation(); });
  refreshClusterInformation();
  shouldDisplayNoDiskSpaceMessage_ = true;
  diskSpaceTimer_ = loop_.addRepeatingTimer(15s, [this] { checkDiskSpace(); });
  checkDiskSpace();
  loadSchedule();
}

void AgentMain::shutdown() {
  clusterInfoTimer_ = nullptr;
  diskSpaceTimer_ = nullptr;
  context_->state.running.set(false);
  const auto controller = captureController();
  while (controller && !controller->hasShutDown()) loop_.run(250ms);
  tellServerOfTheEnd();
  scheduler_.cancel();
  loop_.stop();
}

}  // namespace lmx
