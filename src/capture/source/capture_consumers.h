// The consumers of a capture pipeline.
#pragma once
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "capture/api/capture_framework.h"
#include "capture/gst/gst_handles.h"

namespace lmx {

/// Receives captured media on streaming threads. Must return quickly: queue and return.
class CaptureConsumer {
 public:
  virtual ~CaptureConsumer() = default;
  /// @param buffer  an I420 frame of the pipeline's size (a reference for the consumer)
  /// @param runningTime  seconds
  virtual void onVideo(BufferHandle buffer, double runningTime) = 0;
  /// @param buffer  interleaved 32-bit float samples
  virtual void onAudio(BufferHandle buffer, double runningTime) = 0;
  /// Once at most; on the pipeline's bus thread, or inside CaptureConsumers::add.
  virtual void onCaptureError(const CaptureError& error) = 0;
};

/// The consumers of a pipeline, and the error that stopped it. Consumers are called without the lock held.
/// Thread-safe.
class CaptureConsumers {
 public:
  /// A consumer that is added after the pipeline has failed gets the error at once.
  void add(const std::shared_ptr<CaptureConsumer>& consumer);
  /// A call that is already on its way may still reach the consumer afterwards.
  void remove(const CaptureConsumer* consumer);

  enum class Medium { video, audio };
  void deliver(Medium medium, GstBuffer* buffer, double runningTime) const;
  /// Logs the error and reports it to the consumers. Only the first one counts: others are consequences of
  /// it.
  void fail(const CaptureError& error);
  [[nodiscard]] std::optional<CaptureError> failure() const;

 private:
  using Held = std::vector<std::shared_ptr<CaptureConsumer>>;
  [[nodiscard]] Held heldLocked() const;
  mutable std::mutex mutex_;
  std::vector<std::weak_ptr<CaptureConsumer>> consumers_;  // guarded by mutex_
  std::optional<CaptureError> failure_;                    // guarded by mutex_
};

}  // namespace lmx
