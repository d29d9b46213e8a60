// The main loop's turns and the signals.
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <ctime>
#include <thread>

#include "agent/agent_main.h"
#include "model/codes.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "platform/plist/property_list.h"
#include "prefs/agent_settings.h"
#include "prefs/recording_context.h"
#include "record/capture_delegate.h"
#include "record/create_preview.h"
#include "record/preview_controller.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr std::int64_t kDeviceRetrySeconds = 10;
constexpr std::int64_t kPreviewTimeOutSeconds = 16;
constexpr std::int64_t kRefusalSeconds = 60;
constexpr int kExitDeviceLost = 69;
constexpr const char* kOfflineMessage =
    "Unable to acquire the specified video device. The agent will remain offline until the device becomes "
    "available.";

/// Whether the moment `span` seconds after `begin` is still to come. A clock that was set back behind `begin`
/// knows nothing of it: rather too early than an hour too late.
constexpr bool isAhead(std::int64_t now, std::int64_t begin, std::int64_t span) {
  return now >= begin && now - begin < span;
}

}  // namespace

int AgentMain::appLoop() {
  for (;;) {
    if (deviceDisconnected()) {
      context_->state.running.set(false);
      return 1;
    }
    const std::int64_t now = std::time(nullptr);
    retryDevice(now);
    stopForgottenPreview(now);
    readTimeShift();
    reloadChangedPreferences();
    runDueCommands(std::time(nullptr));
    runLoopRunning_ = loop_.run(timeToNextCommand(250ms)) != RunLoop::Turn::stopped;
    checkServerRefusal(std::time(nullptr));
    if (!context_->state.running.get() || !runLoopRunning_) return 0;
  }
}

void AgentMain::retryDevice(std::int64_t now) {
  const std::int64_t last = context_->state.last_device_check.get();
  if (last < 1 || isAhead(now, last, kDeviceRetrySeconds + 1)) return;
  const auto settings = recordingContext();
  if (!settings) {
    context_->state.running.set(false);
    return;
  }
  const auto record = session();
  record->previewController.set(nullptr);
  const auto controller = record->captureController.get();
  // An agent that records no picture has no camera to wait for.
  const auto preview =
      settings->videoEnabled
          ? LXAgentRecordCreatePreviewController(
                settings->videoDeviceID, settings->audioDeviceID, settings->audioEnabled,
                settings->previewIntervalInMilliseconds, controller ? controller->session() : nullptr)
          : nullptr;
  record->previewController.set(preview);
  if (preview || !settings->videoEnabled) {
    context_->state.last_device_check.set(0);
    shouldDisplayOfflineMessage_ = false;
    if (openTunnel()) {
      loadSchedule();
    } else {
      context_->state.running.set(false);
    }
    return;
  }
  context_->state.last_device_check.set(now);
  if (shouldDisplayOfflineMessage_) {
    LMPLogMessage(nullptr, kLogWarning, "%s", kOfflineMessage);
    shouldDisplayOfflineMessage_ = false;
  } else {
    context_->state.running.set(false);
  }
}

void AgentMain::stopForgottenPreview(std::int64_t now) {
  const auto record = session();
  const auto preview = record ? record->previewController.get() : nullptr;
  if (!preview || !preview->controller().isPreviewRunning()) return;
  const std::int64_t requested = preview->mLastPreviewRequestTime();
  if (requested == 0 || isAhead(now, requested, kPreviewTimeOutSeconds)) return;
  stopPreview();
  preview->setMLastPreviewRequestTime(0);
}

void AgentMain::readTimeShift() {
  const std::string path = systemPath(kTimeShiftFile);
  std::int32_t seconds = 0;
  if (access(path.c_str(), R_OK) == 0) {
    const PlistResult file = readPropertyList(path);
    const PlistDictionary* dictionary = file.value ? file.value->dictionary() : nullptr;
    if (dictionary != nullptr) {
      const auto found = dictionary->find("TimeShiftSeconds");
      if (found != dictionary->end()) seconds = static_cast<std::int32_t>(found->second.asInteger());
    }
  }
  context_->state.timeshift_seconds.set(seconds);
}

void AgentMain::reloadChangedPreferences() {
  if (!agentPrefs_ || !agentPrefs_->prefsFileChanged()) return;
  if (!setAgentPreferencesInContext(*agentPrefs_, *context_)) disableService();
}

void AgentMain::checkServerRefusal(std::int64_t now) {
  const std::int64_t refused = context_->state.serverRejectTime.get();
  if (context_->options.adhoc.get() || refused == 0 || isAhead(now, refused, kRefusalSeconds)) return;
  context_->state.serverRejectTime.set(0);
  LMPLogMessage(context_->log_context(), kLogCritical,
                "Server rejected agent connection, restarting for retry.");
  std::fflush(nullptr);
  _exit(0);  // the service manager starts the agent afresh
}

bool AgentMain::postProcessingIsIdle() const {
  return hand_offs_ == 0 && context_->post_process_list.postProcessListCount() == 0 && !scheduler_.busy();
}

bool AgentMain::deviceDisconnected() {
  const auto record = session();
  const auto delegate = record ? record->captureControllerDelegate.get() : nullptr;
  if (!delegate || !delegate->deviceDisconnected()) return false;
  if (context_->options.adhoc.get()) {
    LMPLogMessage(context_->log_context(), kLogCritical, "The capture device has been disconnected.");
    std::fflush(nullptr);
    _exit(kExitDeviceLost);
  }
  // A recording on its way to the server, also one that is not in the list yet, is brought there first.
  if (!postProcessingIsIdle()) return false;
  LMPLogMessage(context_->log_context(), kLogCritical, "The capture device has been disconnected.");
  std::this_thread::sleep_for(2s);
  return true;
}

std::shared_ptr<LMRRecordingContext> AgentMain::recordingContext() {
  try {
    return context_->options.adhoc.get() ? newRecordingContextForAdHoc(*environment_.framework)
                                         : newRecordingContextForDaemon(*environment_.framework);
  } catch (const std::exception& error) {
    LMPLogMessage(nullptr, kLogCritical, "Unable to load the recording context, exception = %s",
                  error.what());
  } catch (...) {
    LMPLogMessage(nullptr, kLogCritical, "Unable to load the recording context.");
  }
  return nullptr;
}

void AgentMain::pauseOrResume(bool pause) {
  if (!context_->options.adhoc.get()) return pause ? pauseCapture() : resumeCapture();
  const auto controller = captureController();
  if (!controller) return;
  const std::string uuid = session()->recording_uuid.get();
  const double now = secondsSinceReferenceDate() - context_->state.timeshift_seconds.get();
  pause ? controller->setStopWithUUID(uuid, now)
        : controller->setStartWithUUID(uuid, now, context_->state.properties.get());
}

void AgentMain::signal(int number) {
  switch (number) {
    case SIGHUP:
      context_->logDebug("Got Signal (SIGHUP)");
      shutDownControl();
      break;
    case SIGINT:
      context_->logDebug("Got Stop Signal (SIGINT)");
      if (!context_->options.adhoc.get()) stopCapture();
      context_->state.running.set(false);
      break;
    case SIGTERM:
      context_->logDebug("Got Termination Signal (SIGTERM)");
      stopCapture();
      context_->state.running.set(false);
      break;
    case SIGUSR1:
      context_->logDebug("Got Pause Signal");
      pauseOrResume(true);
      break;
    case SIGUSR2:
      context_->logDebug("Got Resume Signal");
      pauseOrResume(false);
      break;
    default:  // SIGPIPE: a broken connection must not end the process
      break;
  }
}

}  // namespace lmx
