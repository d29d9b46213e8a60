// Raw media on their way from the streaming threads to the recorder's thread.
#pragma once
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <mutex>
#include <optional>

#include "capture/gst/gst_handles.h"

namespace lmx {

/// A frame or a chunk of sound.
struct RawMedium {
  BufferHandle buffer;
  double time = 0;  ///< running time of its start, seconds
};
using RawMedia = std::deque<RawMedium>;

/// Live media never wait: what finds the queue full is dropped. Media that come as fast as they are taken
/// wait for room instead. Thread-safe.
class MediaQueue {
 public:
  using Clock = std::chrono::steady_clock;

  /// @param hasVideo  sound then waits for the picture: it alone does not wake the recorder
  MediaQueue(bool hasVideo, bool realTime) : has_video_(hasVideo), real_time_(realTime) {}

  // Streaming threads.
  void pushVideo(RawMedium frame);
  void pushAudio(RawMedium chunk);

  // The recorder's thread.
  struct Batch {
    RawMedia video;
    RawMedia audio;
    bool inTime = true;  ///< false: the deadline has passed
  };
  /// Waits until there is something to do and takes all there is.
  [[nodiscard]] Batch take();
  /// Running time that the picture has reached: sound that does not come in real time stays near it.
  void setPictureHorizon(double time) { picture_horizon_ = time; }

  /// The capture is ending: take() wakes for sound alone, and gives up at `deadline`. The earliest deadline
  /// counts; Clock::time_point::max() is none.
  void hurry(Clock::time_point deadline);
  /// Whether the deadline has passed.
  [[nodiscard]] bool expired() const;
  /// Drops what is queued and all that still comes; nobody waits any more.
  void close();

 private:
  const bool has_video_;
  const bool real_time_;
  mutable std::mutex mutex_;
  std::condition_variable changed_;
  RawMedia video_;                             // guarded by mutex_
  RawMedia audio_;                             // guarded by mutex_
  std::uint64_t dropped_ = 0;                  // guarded by mutex_: frames
  std::optional<Clock::time_point> deadline_;  // guarded by mutex_: absent until the capture is ending
  bool closed_ = false;                        // guarded by mutex_
  std::atomic<double> picture_horizon_{-1e300};
};

}  // namespace lmx
