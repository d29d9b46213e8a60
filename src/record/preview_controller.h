// The preview controller, which knows the time of its last request, and the delegate that keeps the newest
// frame.
#pragma once
#include <atomic>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_framework.h"
#include "support/recursive_mutex.h"
#include "support/shared_value.h"

namespace lmx {

/// Keeps the most recent JPEG frame. Frames arrive on a thread of the framework; channel threads take copies.
class MyLMRPreviewControllerDelegate : public LMRPreviewControllerDelegate {
 public:
  /// @param interval  milliseconds between frames
  explicit MyLMRPreviewControllerDelegate(std::int64_t interval) : interval_(static_cast<int>(interval)) {}

  void setFrameGrabInterval(int milliseconds) override { interval_ = milliseconds; }
  [[nodiscard]] int frameGrabInterval() const { return interval_; }
  void handleJPEGData(std::vector<std::uint8_t> jpeg) override;
  /// The newest frame as Base64; nothing before the first frame.
  [[nodiscard]] std::optional<std::string> base64PreviewFrameCopy();

 private:
  std::atomic<int> interval_;
  RecursiveMutex mLock_;
  std::shared_ptr<const std::vector<std::uint8_t>> mLastJPEGData_;  // guarded by mLock_
};

/// A controller of the framework with the agent's bookkeeping. Thread-safe where the framework's controller
/// is.
class MyLMRPreviewController {
 public:
  explicit MyLMRPreviewController(std::unique_ptr<LMRPreviewController> controller);

  [[nodiscard]] LMRPreviewController& controller() { return *controller_; }
  [[nodiscard]] const std::shared_ptr<MyLMRPreviewControllerDelegate>& delegate() const { return delegate_; }
  void setDelegate(std::shared_ptr<MyLMRPreviewControllerDelegate> delegate);

  /// When a frame was last requested, in seconds since 1970; 0 when no request is pending.
  SharedValue<std::int64_t> mLastPreviewRequestTime;
  /// Sets the request time, then asks the delegate.
  [[nodiscard]] std::optional<std::string> base64PreviewFrameCopy();

 private:
  std::unique_ptr<LMRPreviewController> controller_;
  std::shared_ptr<MyLMRPreviewControllerDelegate> delegate_;
};

}  // namespace lmx
