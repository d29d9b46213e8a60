// Receives the reports of a capture controller and hands them to the main thread.
#pragma once
#include <optional>

#include "capture/api/capture_framework.h"
#include "support/shared_value.h"

namespace lmx {

/// One delegate a controller: a late report of an earlier capture can't be taken for one of the current
/// capture.
class LMRCaptureDelegate : public CaptureControllerDelegate {
 public:
  /// @param controller  the one that reports here; only compared, never used
  explicit LMRCaptureDelegate(const void* controller) : controller_(controller) {}

  void lmrCaptureDidComplete(const std::optional<CaptureError>& error) override;
  void lmrCaptureDidCancel(const std::optional<CaptureError>& error) override;

  /// Whether the last error reported says that a device was lost.
  [[nodiscard]] bool deviceDisconnected() const;
  /// Puts the configured recording type back after a request for sound only.
  void resetDefaultRecordingType() const;

  SharedValue<std::optional<CaptureError>> recordError;  ///< the last error reported

 private:
  const void* controller_;
};

/// Whether `error` belongs to the framework's domain and means that a device was lost.
bool meansDeviceLost(const std::optional<CaptureError>& error);

}  // namespace lmx
