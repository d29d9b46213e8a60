// From late and jittering arrival times to the relation between a microphone's clock and the machine's. Pure.
#pragma once
#include <cstdint>
#include <deque>

namespace lmx {

/// When a stretch of sound was there.
struct SoundStamp {
  double heard = 0;    ///< seconds by the microphone's clock: samples so far, divided by the nominal rate
  double arrival = 0;  ///< running time at which the last of them was there, seconds
};

/// Sound can only arrive late, never early: the earliest arrivals of each second show the clock, all others
/// the scheduler. A filter that averages, as delay-locked loops do, would settle in the middle of the jitter,
/// which is 21 ms late when three chunks come at once. Not thread-safe.
class ClockFilter {
 public:
  /// Begins anew with a stamp that is taken for punctual; what is known of the speed stays.
  void restart(const SoundStamp& stamp);
  /// Takes one stamp in; stamps ascend in `heard`. Call restart() before the first one.
  void observe(const SoundStamp& stamp);

  /// Running time at which the microphone had heard that many seconds.
  [[nodiscard]] double timeAt(double heard) const {
    return anchor_.arrival + (heard - anchor_.heard) * secondsPerSecond();
  }
  /// How late a stamp is, seconds.
  [[nodiscard]] double lateness(const SoundStamp& stamp) const { return stamp.arrival - timeAt(stamp.heard); }
  /// Seconds that pass while the microphone counts one.
  [[nodiscard]] double secondsPerSecond() const { return 1 + slope_; }

 private:
  [[nodiscard]] double offset(const SoundStamp& stamp) const {
    return stamp.arrival - stamp.heard * secondsPerSecond();
  }
  using Stamps = std::deque<SoundStamp>;
  [[nodiscard]] SoundStamp earliest(Stamps::const_iterator first, Stamps::const_iterator last) const;
  void measureSpeed();
  void setAnchor();

  Stamps punctual_;  ///< the earliest arrival of each second; the last second is still growing
  std::int64_t second_ = 0;
  SoundStamp anchor_;
  double slope_ = 0;
};

}  // namespace lmx
