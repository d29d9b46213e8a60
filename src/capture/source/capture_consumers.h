// The users of a source.
#pragma once
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "capture/api/capture_framework.h"
#include "capture/gst/gst_handles.h"

namespace lmx {

/// Which media of a source somebody uses.
struct SourceUse {
  bool picture = false;
  bool sound = false;
};

/// Receives captured media on streaming threads, and news of the source on its own thread or inside
/// CaptureConsumers::add. Must return quickly: queue and return. Times are running time in seconds.
class CaptureConsumer {
 public:
  virtual ~CaptureConsumer() = default;
  /// @param picture  decoded, of any raw format and size
  virtual void onPicture(SampleHandle picture, double time) = 0;
  /// @param sound  interleaved 32-bit float samples, kSoundRate, kSoundChannels
  virtual void onSound(BufferHandle sound, double time) = 0;
  /// The source is lost for good. Once at most.
  virtual void onSourceLost(SourceUse use, const CaptureError& error) = 0;
  /// Nothing comes at the moment; it is being opened again.
  virtual void onSourceAway(SourceUse use, const CaptureError& error) = 0;
  /// It delivers again, after `seconds`.
  virtual void onSourceBack(SourceUse use, double seconds) = 0;
};

/// The users of a source, and what they have to know of it. Media are delivered without any lock held. News
/// come one after the other, so that nobody hears of a return before the loss: no user may add one from
/// inside a call. Thread-safe.
class CaptureConsumers {
 public:
  /// One that is added while the source is away, or after it was lost, is told at once.
  void add(const std::shared_ptr<CaptureConsumer>& consumer, SourceUse use);
  /// A call that is already on its way may still reach the consumer afterwards.
  void remove(const CaptureConsumer* consumer);

  void deliverPicture(GstSample* picture, double time) const;
  void deliverSound(GstBuffer* sound, double time) const;

  /// Only the first loss counts: others are consequences of it.
  void lost(const CaptureError& error);
  void away(const CaptureError& error);
  void back(double seconds);
  /// The device gives pictures but no sound: for users of its sound that is away.
  void noSound(const CaptureError& error);
  /// It gives sound again, after `seconds`.
  void soundBack(double seconds);
  [[nodiscard]] std::optional<CaptureError> failure() const;

 private:
  struct User {
    std::weak_ptr<CaptureConsumer> consumer;
    SourceUse use;
  };
  struct Held {
    std::shared_ptr<CaptureConsumer> consumer;
    SourceUse use;
  };
  [[nodiscard]] std::vector<Held> heldLocked() const;
  [[nodiscard]] std::vector<Held> held() const;
  std::mutex news_mutex_;  ///< held while news are told
  mutable std::mutex mutex_;
  std::vector<User> users_;              // guarded by mutex_
  std::optional<CaptureError> failure_;  // guarded by mutex_
  std::optional<CaptureError> away_;     // guarded by mutex_
  std::optional<CaptureError> mute_;     // guarded by mutex_
};

}  // namespace lmx
