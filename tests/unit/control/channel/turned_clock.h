// A clock that is turned by hand.
#pragma once
#include <atomic>
#include <chrono>
#include <optional>
#include <stdexcept>
#include <string>

#include "control/channel/channel_clock.h"
#include "tests/unit/doubles/journal.h"

namespace lmx::testing {

/// Wall clock plus an offset that the test sets, or a moment that it names; sleeping takes no time and is
/// written down.
class TurnedClock : public ChannelClock {
 public:
  std::atomic<std::int64_t> ahead_seconds{0};
  std::atomic<std::int64_t> frozen_at{-1};  ///< seconds since 1970; negative: running
  std::atomic<bool> readable{true};
  std::atomic<bool> throws{false};  ///< now() does
  Journal sleeps;

  std::optional<TimeValue> now() override {
    if (throws) throw std::runtime_error("the clock has stopped");
    auto time = lmp_gettimeofday();
    if (!readable || !time) return std::nullopt;
    if (frozen_at >= 0) return TimeValue{frozen_at, 0};
    time->tv_sec += ahead_seconds;
    return time;
  }
  std::chrono::steady_clock::time_point steadyNow() override {
    return std::chrono::steady_clock::now() + std::chrono::seconds(ahead_seconds);
  }
  std::atomic<bool> real_sleep{false};
  void sleep(std::chrono::milliseconds span, int wake, int other) override {
    sleeps.add(std::to_string(span.count()));
    if (real_sleep) systemChannelClock().sleep(span, wake, other);
  }
};

}  // namespace lmx::testing
