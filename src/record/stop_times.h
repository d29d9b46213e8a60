// Deadlines that end a recording nobody stops: hard stop and soft stop.
#pragma once
#include <cstdint>
#include <mutex>
#include <optional>

#include "support/shared_value.h"
#include "support/time_value.h"

namespace lmx {

/// Deadlines are wall-clock times; one that is not set is absent. When the wall clock is set they move with
/// it, because they limit the length of a recording. Thread-safe.
class StopTimes {
 public:
  using Time = std::optional<TimeValue>;

  SharedValue<Time> hardStopTime;  ///< the recording never runs past this time
  SharedValue<Time> softStopTime;  ///< ends a recording that no server or client asks about
  SharedValue<std::int32_t> maxUnattendedRecordingMinutes;  ///< 0 or less: no soft stop

  /// Sets the soft stop to now plus the unattended minutes, or clears it when those are 0 or less.
  void updateSoftStopTime();
  /// Sets the hard stop to `seconds` from now; 0 or less clears it.
  void setRecordHardStopTimeSeconds(std::int32_t seconds);
  /// Whether a deadline has passed (logged).
  bool shouldStopRecording();
  /// Clears both deadlines.
  void clear();
  /// Clears deadlines that have passed. They would end a recording at its first check.
  void clearPassedDeadlines();
  /// Moves the deadlines if the wall clock was set since the last call.
  /// @param offset  see wallClockOffset()
  void followWallClock(std::int64_t offset);
  /// Copies the deadlines and the limit of `other`.
  void take(const StopTimes& other);

 private:
  std::mutex clock_mutex_;
  std::optional<std::int64_t> clock_offset_;  // guarded by clock_mutex_; from the last followWallClock
};

}  // namespace lmx
