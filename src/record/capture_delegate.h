// Receives the reports of a capture controller and passes them to the main thread.
#pragma once
#include <optional>

#include "capture/api/capture_framework.h"
#include "support/shared_value.h"

namespace lmx {

/// One delegate per controller, so that a late report of an earlier capture isn't attributed to the current
/// one.
class LMRCaptureDelegate : public CaptureControllerDelegate {
 public:
  /// @param controller  the reporting controller; compared but never dereferenced
  explicit LMRCaptureDelegate(const void* controller) : controller_(controller) {}

  void lmrCaptureDidComplete(const std::optional<CaptureError>& error) override;
  void lmrCaptureDidCancel(const std::optional<CaptureError>& error) override;

  /// Whether the last reported error means that a device was lost.
  [[nodiscard]] bool deviceDisconnected() const;
  /// Restores the configured recording type after an audio-only request.
  void resetDefaultRecordingType() const;

  SharedValue<std::optional<CaptureError>> recordError;  ///< the last error reported

 private:
  const void* controller_;
};

/// Whether `error` is in the framework's domain and means that a device was lost.
bool meansDeviceLost(const std::optional<CaptureError>& error);

}  // namespace lmx
