// Receives the reports of a capture controller and passes them to the main thread.
#pragma once
#include <memory>
#include <mutex>
#include <optional>

#include "capture/api/capture_framework.h"
#include "support/shared_value.h"

namespace lmx {

class AgentRecord;

/// One delegate per controller, so that a late report of an earlier capture isn't attributed to the current
/// one.
class LMRCaptureDelegate : public CaptureControllerDelegate {
 public:
  /// @param controller  the reporting controller; compared but never dereferenced
  explicit LMRCaptureDelegate(const void* controller) : controller_(controller) {}

  void lmrCaptureSoundLost(const CaptureError& error) override;
  void lmrCaptureSoundBack() override;
  void lmrCaptureDidComplete(const std::optional<CaptureError>& error) override;
  void lmrCaptureDidCancel(const std::optional<CaptureError>& error) override;

  /// Sets the error of `session`, whose START has succeeded: none, unless the microphone is missing already.
  void startHasSucceeded(AgentRecord& session);

  /// Whether the last reported error means that a device was lost.
  [[nodiscard]] bool deviceDisconnected() const;
  /// Restores the configured recording type after an audio-only request.
  void resetDefaultRecordingType() const;

  SharedValue<std::optional<CaptureError>> recordError;  ///< the last error reported

 private:
  [[nodiscard]] std::shared_ptr<AgentRecord> recordingSession() const;

  const void* controller_;
  std::mutex sound_mutex_;  ///< guards sound_lost_ together with the session's error
  bool sound_lost_ = false;
};

/// Whether `error` is in the framework's domain and means that a device was lost.
bool meansDeviceLost(const std::optional<CaptureError>& error);

}  // namespace lmx
