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
  /// @param session  one that is open, or being opened: used if it is of the camera that is chosen
  explicit PreviewController(const std::shared_ptr<CaptureSession>& session)
      : ahead_(std::dynamic_pointer_cast<Source>(session)) {}
  /// The camera as a preview opens it.
  static Result<SourceLease, CaptureError> lease(const std::string& camera);
  bool attachIOWithDevice(const std::string& device, CaptureError* error) override;
  void addAudioDeviceWithID(const std::optional<std::string>& device) override;
  [[nodiscard]] std::string videoDeviceLocalizedDisplayName() const override;
  void setDelegate(std::shared_ptr<LMRPreviewControllerDelegate> /*delegate*/) override {}
  [[nodiscard]] std::shared_ptr<CaptureSession> session() const override;
  void startPreview() override;
  void stopPreview() override;
  [[nodiscard]] bool isPreviewRunning() const override;

 private:
  SourceLease ahead_;  ///< until a camera is chosen
  mutable std::mutex mutex_;
  std::string camera_;  // guarded by mutex_
  std::string name_;    // guarded by mutex_
  SourceLease lease_;   // guarded by mutex_: null unless it runs
};

}  // namespace lmx
