// Passes capture reports on to the main thread.
#include "record/capture_delegate.h"

#include <algorithm>
#include <array>

#include "capture/api/capture_framework.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "model/codes.h"
#include "prefs/recording_types.h"
#include "record/agent_record.h"
#include "record/engine_environment.h"

namespace lmx {

bool meansDeviceLost(const std::optional<CaptureError>& error) {
  static constexpr std::array<int, 8> kLost{kDeviceNotFound,     kDeviceRemoved, kDeviceBusy,   kDeviceFailed,
                                            kDeviceNotPermitted, kStreamEnded,   kDeviceSilent, kAudioSilent};
  return error && error->domain == CaptureError::kDomain &&
         std::find(kLost.begin(), kLost.end(), error->code) != kLost.end();
}

void LMRCaptureDelegate::lmrCaptureSoundLost(const CaptureError& /*error*/) {
  const std::lock_guard lock(sound_mutex_);
  sound_lost_ = true;
  if (const auto session = recordingSession()) session->error.set(kRecordNoInput);
}

void LMRCaptureDelegate::lmrCaptureSoundBack() {
  const std::lock_guard lock(sound_mutex_);
  sound_lost_ = false;
  // An error that came in between stays: it is the newer one, and not over.
  if (const auto session = recordingSession()) session->error.replace(kRecordNoInput, kRecordSuccess);
}

void LMRCaptureDelegate::startHasSucceeded(AgentRecord& session) {
  const std::lock_guard lock(sound_mutex_);
  session.error.set(sound_lost_ ? kRecordNoInput : kRecordSuccess);
}

void LMRCaptureDelegate::lmrCaptureDidComplete(const std::optional<CaptureError>& error) {
  // Notify the agent first: by the time the error is visible, the main loop must know that a submission is
  // pending.
  if (AgentActions* actions = engineEnvironment().actions) actions->captureDidComplete(controller_);
  if (error) recordError.set(error);
  resetDefaultRecordingType();
}

void LMRCaptureDelegate::lmrCaptureDidCancel(const std::optional<CaptureError>& error) {
  if (error) recordError.set(error);
  if (AgentActions* actions = engineEnvironment().actions) actions->captureDidCancel(controller_);
  resetDefaultRecordingType();
}

bool LMRCaptureDelegate::deviceDisconnected() const { return meansDeviceLost(recordError.get()); }

/// The session, unless it is already recording again, with another controller.
std::shared_ptr<AgentRecord> LMRCaptureDelegate::recordingSession() const {
  const auto context = engineEnvironment().context;
  auto session = context ? context->record_context() : nullptr;
  return session && session->captureController.get().get() == controller_ ? session : nullptr;
}

void LMRCaptureDelegate::resetDefaultRecordingType() const {
  const auto context = engineEnvironment().context;
  const auto session = recordingSession();
  if (!session) return;  // the type is already that of the new recording
  session->recordingType.set(recTypeToCode(context->recording.recording_type.get()));
  session->audioOnlyMode.set(false);
}

}  // namespace lmx
