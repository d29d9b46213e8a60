// The clock that all sources share.
#pragma once
#include <gst/gst.h>

namespace lmx {

/// Running time counts the seconds of the system's monotonic clock since its first use in this process, for
/// all devices alike: the times of two devices compare, and setting the wall clock does not affect them.
/// Devices of "speed=max" have a time of their own, which starts at 0 and runs as fast as they deliver. A
/// value; thread-safe.
class CaptureClock {
 public:
  /// @param realTime  false for devices of "speed=max": their time 0 corresponds to now
  explicit CaptureClock(bool realTime);

  [[nodiscard]] bool realTime() const { return real_time_; }
  /// Running time that corresponds to a wall-clock time (seconds since 2001-01-01 UTC) as the clock is set
  /// now.
  [[nodiscard]] double runningTimeAt(double wallTime) const { return wallTime - wallOffset(); }
  /// Wall-clock time of running time 0, as the clock is set now.
  [[nodiscard]] double wallOffset() const;

  /// Running time now, seconds.
  static double now();
  /// Running time of a time of GStreamer's system clock, seconds.
  static double at(GstClockTime time);

 private:
  bool real_time_;
  double opened_at_;
};

}  // namespace lmx
