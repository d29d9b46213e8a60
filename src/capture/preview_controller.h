// Looks at a camera without recording: proves that it can be had, and holds it open while a preview runs.
#pragma once
#include <mutex>
#include <string>

#include "capture/source/sources.h"

namespace lmx {

/// The camera is open only while a preview runs: its lamp must not be lit in an empty room. No pictures are
/// taken of a preview, so its delegate is never called. Thread-safe.
class PreviewController : public LMRPreviewController {
 public:
  /// Needs no session: devices that are open are found and shared.
  explicit PreviewController(const std::shared_ptr<CaptureSession>& /*session*/) {}
  bool attachIOWithDevice(const std::string& device, CaptureError* error) override;
  void addAudioDeviceWithID(const std::optional<std::string>& device) override;
  [[nodiscard]] std::string videoDeviceLocalizedDisplayName() const override;
  void setDelegate(std::shared_ptr<LMRPreviewControllerDelegate> /*delegate*/) override {}
  [[nodiscard]] std::shared_ptr<CaptureSession> session() const override;
  void startPreview() override;
  void stopPreview() override;
  [[nodiscard]] bool isPreviewRunning() const override;

 private:
  mutable std::mutex mutex_;
  SourceWish wish_;    // guarded by mutex_
  std::string name_;   // guarded by mutex_
  SourceLease lease_;  // guarded by mutex_: null unless it runs
};

}  // namespace lmx
