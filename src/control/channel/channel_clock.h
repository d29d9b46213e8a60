// The clock of the channels. Tests replace it by one that they advance by hand.
#pragma once
#include <chrono>
#include <optional>

#include "support/time_value.h"

namespace lmx {

/// Thread-safe.
class ChannelClock {
 public:
  virtual ~ChannelClock() = default;
  /// Wall clock; absent when it can't be read.
  virtual std::optional<TimeValue> now() = 0;
  /// For spans of time: setting the wall clock doesn't move it.
  virtual std::chrono::steady_clock::time_point steadyNow() = 0;
  /// Sleeps for `span`, less when descriptor `wake` or `other` becomes readable (negative: none).
  virtual void sleep(std::chrono::milliseconds span, int wake, int other = -1) = 0;
};

/// The real one. Lives as long as the process.
ChannelClock& systemChannelClock();

}  // namespace lmx
