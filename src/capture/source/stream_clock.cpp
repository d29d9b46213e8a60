// Compares a camera's stamps with their arrival.
#include "capture/source/stream_clock.h"

#include <algorithm>
#include <cmath>

namespace lmx {
namespace {

/// All in seconds. A network that was slow for less than this moves nothing.
constexpr double kWindow = 10;
/// Before, nothing is known about the network.
constexpr double kStart = 5;
/// Nothing comes before it is taken: the stamps have jumped.
constexpr double kEarly = 1;
/// A network may hold up that much.
constexpr double kLate = 4;
/// Both streams of a camera whose clock is set jump by the same, as well as can be told from their arrival.
constexpr double kSameJump = 0.5;
/// Time in which an error is made up for, were it not for the limit.
constexpr double kCorrectionSeconds = 50;
/// Greatest speed of that; a worse clock leads to jumps.
constexpr double kGreatestCorrection = 0.02;
/// That early is as good as in time: a correction costs a picture.
constexpr double kLittleEarly = 0.04;

}  // namespace

double StreamClock::place(Stream stream, double time, double arrival) {
  const std::lock_guard lock(mutex_);
  const bool picture = stream == Stream::picture;
  Part& part = picture ? picture_ : sound_;
  makeUpForJump(part, picture ? sound_ : picture_, time, arrival);
  const double stamp = time + part.shift;
  observe(part, arrival - stamp, arrival);
  if (picture || picture_.seconds.empty()) follow(part, arrival);
  return stamp + correction_;
}

void StreamClock::makeUpForJump(Part& part, const Part& other, double time, double arrival) {
  if (part.seconds.empty()) return;
  const double lateness = arrival - (time + part.shift);
  const double usual = usualLateness(part);
  // At the start, when the machine has much to do, all may be late: what is early then is in time.
  const bool early = lateness < std::min(usual, correction_) - kEarly;
  if (!early && lateness < usual + kLate) return;
  double jump = lateness - usual;
  const bool both = other.last_jump && arrival - other.jumped_at < kWindow;
  if (both && std::abs(jump - *other.last_jump) < kSameJump) jump = *other.last_jump;
  part.shift += jump;
  part.last_jump = jump;
  part.jumped_at = arrival;
}

void StreamClock::observe(Part& part, double lateness, double arrival) {
  auto& seconds = part.seconds;
  if (seconds.empty() || arrival - seconds.back().arrival >= 1) {
    seconds.push_back({arrival, lateness});
    while (arrival - seconds.front().arrival > kWindow) seconds.pop_front();
  } else {
    seconds.back().lateness = std::min(seconds.back().lateness, lateness);
  }
}

double StreamClock::usualLateness(const Part& part) {
  return std::min_element(part.seconds.begin(), part.seconds.end(),
                          [](const Second& a, const Second& b) { return a.lateness < b.lateness; })
      ->lateness;
}

void StreamClock::follow(const Part& lead, double arrival) {
  if (!begun_) begun_ = followed_at_ = arrival;
  const double passed = std::clamp(arrival - followed_at_, 0.0, 1.0);
  followed_at_ = std::max(followed_at_, arrival);
  if (!right_ && arrival - *begun_ < kStart) return;
  // The stamps begin with the arrival of the first packet. If that was late others seem to come early.
  if (!right_) right_ = std::max(-kLittleEarly, usualLateness(lead));
  const double error = usualLateness(lead) - *right_ - correction_;
  correction_ += passed * std::clamp(error / kCorrectionSeconds, -kGreatestCorrection, kGreatestCorrection);
}

}  // namespace lmx
