// The preview controller with the time of its last request, and the delegate that keeps the newest frame.
#pragma once
#include <atomic>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_framework.h"
#include "support/recursive_mutex.h"

namespace lmx {

/// Keeps the most recent JPEG frame. Frames come on a thread of the framework, copies are taken on channel
/// threads.
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

/// A controller of the framework with the agent's own bookkeeping. Thread-safe where the framework's
/// controller is.
class MyLMRPreviewController {
 public:
  explicit MyLMRPreviewController(std::unique_ptr<LMRPreviewController> controller);

  [[nodiscard]] LMRPreviewController& controller() { return *controller_; }
  [[nodiscard]] const std::shared_ptr<MyLMRPreviewControllerDelegate>& delegate() const { return delegate_; }
  void setDelegate(std::shared_ptr<MyLMRPreviewControllerDelegate> delegate);

  /// Seconds since 1970 of the last request for a frame; 0 when none is pending.
  [[nodiscard]] std::int64_t mLastPreviewRequestTime() const { return last_request_; }
  void setMLastPreviewRequestTime(std::int64_t seconds) { last_request_ = seconds; }
  /// Stamps the request time, then asks the delegate.
  [[nodiscard]] std::optional<std::string> base64PreviewFrameCopy();

 private:
  std::unique_ptr<LMRPreviewController> controller_;
  std::shared_ptr<MyLMRPreviewControllerDelegate> delegate_;
  std::atomic<std::int64_t> last_request_{0};
};

}  // namespace lmx
