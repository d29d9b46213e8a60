// Capture reports on their way to the main thread.
#include "record/capture_delegate.h"

#include <algorithm>
#include <array>

#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "prefs/agent_preferences.h"
#include "record/engine.h"

namespace lmx {

bool meansDeviceLost(const std::optional<CaptureError>& error) {
  static constexpr std::array kLost{1002, 1003, 1100, 1200, 1201, 1203, 1300, 1302};
  return error && error->domain == CaptureError::kDomain &&
         std::find(kLost.begin(), kLost.end(), error->code) != kLost.end();
}

void LMRCaptureDelegate::lmrCaptureDidComplete(const std::optional<CaptureError>& error) {
  // The agent first: once the error can be seen, the main loop must know that there is still something to
  // submit.
  if (AgentActions* actions = engineEnvironment().actions) actions->captureDidComplete(controller_);
  if (error) setRecordError(error);
  resetDefaultRecordingType();
}

void LMRCaptureDelegate::lmrCaptureDidCancel(const std::optional<CaptureError>& error) {
  if (error) setRecordError(error);
  if (AgentActions* actions = engineEnvironment().actions) actions->captureDidCancel(controller_);
  resetDefaultRecordingType();
}

bool LMRCaptureDelegate::deviceDisconnected() const { return meansDeviceLost(recordError()); }

void LMRCaptureDelegate::resetDefaultRecordingType() const {
  const auto context = engineEnvironment().context;
  const auto session = context ? context->record_context() : nullptr;
  // A session that records on already has another controller: its type is that of the new recording.
  if (!session || session->captureController().get() != controller_) return;
  const auto type = context->recording_type();
  session->setRecordingType(AgentPreferences::recTypeToCode(type ? type->c_str() : nullptr));
  session->setAudioOnlyMode(false);
}

}  // namespace lmx
