// Runs the periodic checks of the main loop.
#include "agent/main_loop.h"

#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <ctime>
#include <utility>

#include "agent/elapsed.h"
#include "agent/recording_in_hand.h"
#include "agent/service_disable.h"
#include "agent/time_shift.h"
#include "model/codes.h"
#include "platform/log.h"
#include "prefs/agent_settings.h"
#include "record/preview_controller.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

constexpr std::int64_t kPreviewTimeOutSeconds = 16;
constexpr std::int64_t kRefusalSeconds = 60;

}  // namespace

int MainLoop::appLoop() {
  AgentState& state = parts_.context.state;
  for (;;) {
    if (parts_.devices.deviceDisconnected()) {
      parts_.devices.announceLostDevice();
      state.running.set(false);
      return 1;
    }
    const std::int64_t now = std::time(nullptr);
    parts_.devices.retryDevice(now);
    stopForgottenPreview(now);
    readTimeShift(state);
    reloadChangedPreferences();
    parts_.timed_commands.postDueCommand(std::time(nullptr));
    const auto turn = parts_.loop.run(parts_.timed_commands.timeToNextCommand(250ms));
    checkServerRefusal(std::time(nullptr));
    if (!state.running.get() || turn == RunLoop::Turn::stopped) return 0;
  }
}

void MainLoop::stopForgottenPreview(std::int64_t now) {
  const auto record = parts_.context.record_context();
  const auto preview = record ? record->previewController.get() : nullptr;
  if (!preview || !preview->controller().isPreviewRunning()) return;
  const std::int64_t requested = preview->mLastPreviewRequestTime.get();
  if (requested == 0 || isAhead(now, requested, kPreviewTimeOutSeconds)) return;
  parts_.capture.stopPreview();
  preview->mLastPreviewRequestTime.set(0);
}

void MainLoop::reloadChangedPreferences() {
  if (preferences_ == nullptr || !preferences_->prefsFileChanged()) return;
  if (!setAgentPreferencesInContext(*preferences_, parts_.context)) disableService(*parts_.service_manager);
}

void MainLoop::checkServerRefusal(std::int64_t now) {
  AgentState& state = parts_.context.state;
  const std::int64_t refused = state.serverRejectTime.get();
  if (parts_.context.options.adhoc.get() || refused == 0 || isAhead(now, refused, kRefusalSeconds)) return;
  if (recordingInHand(parts_.context) || !parts_.submission.isIdle()) {
    if (!std::exchange(refusal_waits_, true)) {
      LMPLogMessage(parts_.context.log_context(), kLogNotice,
                    "Server rejected agent connection; the restart waits until the recording is submitted");
    }
    return;
  }
  state.serverRejectTime.set(0);
  LMPLogMessage(parts_.context.log_context(), kLogCritical,
                "Server rejected agent connection, restarting for retry.");
  std::fflush(nullptr);
  _exit(exitStatus(ProcessEnd::orderly));  // the service manager restarts the agent
}

}  // namespace lmx
