// The lower envelope of the arrival times.
#include "capture/source/clock_filter.h"

#include <algorithm>
#include <cmath>
#include <iterator>

namespace lmx {
namespace {

/// Seconds that the speed is measured over; less, and the jitter of single arrivals shows in it.
constexpr std::size_t kSpeedSeconds = 120;
/// Fewer tell nothing about the speed.
constexpr std::size_t kFewestSeconds = 10;
/// The latest seconds decide where the sound is. Longer, and a speed that is not yet known would show.
constexpr std::ptrdiff_t kPlaceSeconds = 5;
/// Distance of two measurements, seconds, from which on their difference is believed at once.
constexpr double kCertainDistance = 40;
/// No real clock is further off; that of a capture card that takes 59.94 for 60 is off by 1000e-6.
constexpr double kGreatestSlope = 3000e-6;

}  // namespace

void ClockFilter::restart(const SoundStamp& stamp) {
  punctual_ = {stamp};
  second_ = std::llround(std::floor(stamp.heard));
  anchor_ = stamp;
}

void ClockFilter::observe(const SoundStamp& stamp) {
  const auto second = std::llround(std::floor(stamp.heard));
  if (second != second_) {
    second_ = second;
    measureSpeed();
    punctual_.push_back(stamp);
    if (punctual_.size() > kSpeedSeconds) punctual_.pop_front();
  } else if (offset(stamp) < offset(punctual_.back())) {
    punctual_.back() = stamp;
  }
  setAnchor();
}

SoundStamp ClockFilter::earliest(Stamps::const_iterator first, Stamps::const_iterator last) const {
  return *std::min_element(
      first, last, [this](const SoundStamp& a, const SoundStamp& b) { return offset(a) < offset(b); });
}

/// Compares the earliest arrival of the older half with that of the newer half.
void ClockFilter::measureSpeed() {
  if (punctual_.size() < kFewestSeconds) return;
  const auto middle = punctual_.cbegin() + static_cast<std::ptrdiff_t>(punctual_.size() / 2);
  const SoundStamp before = earliest(punctual_.cbegin(), middle);
  const SoundStamp after = earliest(middle, punctual_.cend());
  const double distance = after.heard - before.heard;
  if (distance <= 0) return;
  const double error = (offset(after) - offset(before)) / distance;
  slope_ = std::clamp(slope_ + error * std::min(1.0, distance / kCertainDistance), -kGreatestSlope,
                      kGreatestSlope);
}

void ClockFilter::setAnchor() {
  const auto size = static_cast<std::ptrdiff_t>(punctual_.size());
  anchor_ = earliest(punctual_.cend() - std::min(size, kPlaceSeconds), punctual_.cend());
}

}  // namespace lmx
