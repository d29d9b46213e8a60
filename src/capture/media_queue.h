// Queues raw media between the streaming threads and the recording thread.
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
  double time = 0;       ///< running time of its start, seconds
  CapsHandle caps = {};  ///< of a frame
};
using RawMedia = std::deque<RawMedium>;

/// Live media never wait: when the queue is full they are dropped. Media of devices that are not live
/// ("speed=max") wait for room instead. Thread-safe.
class MediaQueue {
 public:
  using Clock = std::chrono::steady_clock;

  /// @param hasVideo  if so, sound alone does not wake the recording thread: it is cut along the picture
  MediaQueue(bool hasVideo, bool realTime) : has_video_(hasVideo), real_time_(realTime) {}

  // Streaming threads.
  void pushVideo(RawMedium frame);
  void pushAudio(RawMedium chunk);

  // The recording thread.
  struct Batch {
    RawMedia video;
    RawMedia audio;
    bool inTime = true;      ///< false: the deadline has passed
    std::uint32_t lost = 0;  ///< frames that were dropped since the last batch
    double lostFrom = 0;     ///< running time of the first of them
  };
  /// Waits until there are media to work on, `idle` at most, and takes all of them.
  [[nodiscard]] Batch take(Clock::duration idle = std::chrono::hours(24));
  /// Running time that the picture has reached. Sound that is not live waits when it is far ahead of it.
  void setPictureHorizon(double time) { picture_horizon_ = time; }

  /// The capture is ending: from now on sound alone wakes take(), which gives up at `deadline`. The earliest
  /// deadline counts; Clock::time_point::max() means none.
  void hurry(Clock::time_point deadline);
  /// Whether the deadline has passed.
  [[nodiscard]] bool expired() const;
  /// Frames that were dropped because the recording thread was too far behind.
  [[nodiscard]] std::uint64_t dropped() const;
  /// Discards what is queued and what is pushed later. No push waits any more.
  void close();

 private:
  const bool has_video_;
  const bool real_time_;
  mutable std::mutex mutex_;
  std::condition_variable changed_;
  RawMedia video_;                             // guarded by mutex_
  std::size_t video_bytes_ = 0;                // guarded by mutex_
  RawMedia audio_;                             // guarded by mutex_
  std::uint64_t dropped_ = 0;                  // guarded by mutex_: frames
  std::uint32_t lost_ = 0;                     // guarded by mutex_: of these, since the last batch
  double lost_from_ = 0;                       // guarded by mutex_
  std::optional<Clock::time_point> deadline_;  // guarded by mutex_: absent until the capture is ending
  bool closed_ = false;                        // guarded by mutex_
  std::atomic<double> picture_horizon_{-1e300};
};

}  // namespace lmx
