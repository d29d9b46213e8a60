// A moment at which every wait ends.
#pragma once
#include <atomic>
#include <chrono>

namespace lmx {

/// Never, until somebody sets it; the earliest moment counts. Thread-safe.
class Deadline {
 public:
  using Clock = std::chrono::steady_clock;

  void set(Clock::time_point when) {
    const Clock::rep ticks = when.time_since_epoch().count();
    for (Clock::rep old = ticks_; ticks < old && !ticks_.compare_exchange_weak(old, ticks);) {
    }
  }
  [[nodiscard]] bool passed() const { return Clock::now().time_since_epoch().count() >= ticks_; }

 private:
  std::atomic<Clock::rep> ticks_{Clock::time_point::max().time_since_epoch().count()};
};

/// How often a wait looks whether its deadline has passed: nobody wakes it for that.
inline constexpr std::chrono::milliseconds kDeadlineCheck{100};

}  // namespace lmx
