// The deadlines that end a recording that nobody ends: hard stop and soft stop.
#pragma once
#include <cstdint>
#include <mutex>
#include <optional>

#include "support/shared_value.h"
#include "support/time_value.h"

namespace lmx {

/// Deadlines are wall-clock times; one that is not set is absent. They move along with a wall clock that is
/// set: they say how long a recording may last. Thread-safe.
class StopTimes {
 public:
  using Time = std::optional<TimeValue>;

  SharedValue<Time> hardStopTime;  ///< no recording lasts longer
  SharedValue<Time> softStopTime;  ///< ends a recording that no server and no client asks about
  SharedValue<std::int32_t> maxUnattendedRecordingMinutes;  ///< 0 or less: no soft stop

  /// Recomputes the soft stop: now plus the unattended minutes, or none when those are 0 or less.
  void updateSoftStopTime();
  /// Sets the hard stop `seconds` from now; 0 or less clears it.
  void setRecordHardStopTimeSeconds(std::int32_t seconds);
  /// Whether a deadline has passed (logged).
  bool shouldStopRecording();
  /// Forgets both deadlines.
  void clear();
  /// Forgets deadlines that have passed: they would end a recording at its first check.
  void clearPassedDeadlines();
  /// Moves the deadlines along when the wall clock was set since the last call.
  /// @param offset  see wallClockOffset()
  void followWallClock(std::int64_t offset);
  /// Takes over the deadlines and the limit of `other`.
  void take(const StopTimes& other);

 private:
  std::mutex clock_mutex_;
  std::optional<std::int64_t> clock_offset_;  // guarded by clock_mutex_; that of the last followWallClock
};

}  // namespace lmx
