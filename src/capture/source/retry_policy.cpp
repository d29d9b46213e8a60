// Limits and pauses.
#include "capture/source/retry_policy.h"

#include <algorithm>

#include "capture/api/capture_framework.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

using Milliseconds = RetryPolicy::Milliseconds;

constexpr Milliseconds kUdpLimit = 5s;      // a refusal of TCP comes at once
constexpr Milliseconds kBusyPatience = 2s;  // a driver's time for closing
constexpr Milliseconds kBusyPause = 100ms;
constexpr Milliseconds kSoonPause = 500ms;  // a camera whose connection broke may take the next one
constexpr Milliseconds kPause = 3s;
constexpr Milliseconds kLastTry = 1s;  // before a network camera's limit
constexpr int kOftenTries = 20;
constexpr Milliseconds kSeldomPause = 10s;  // looking for a device wakes the drivers of all

}  // namespace

RetryPolicy::Next RetryPolicy::after(const Failure& failure) {
  if (offersOnlyUdp(failure)) {
    over_udp_ = true;
    return {.step = Next::Step::again, .pause = 0ms};
  }
  if (isAboutToBeReleased(failure)) return {.step = Next::Step::again, .pause = kBusyPause};
  if (!isWorthAnotherTry(failure)) return {.step = Next::Step::lost, .pause = 0ms};
  failed_tries_ = failure.awayFor ? failed_tries_ + 1 : 0;
  if (!failure.everRan) over_udp_ = false;  // nothing is known of it: the next try begins as the first one
  return {.step = Next::Step::away, .pause = pauseAfter(failure)};
}

bool RetryPolicy::offersOnlyUdp(const Failure& failure) const {
  if (!network_ || over_udp_ || failure.everRan || failure.delivered) return false;
  return failure.code != kDeviceNotPermitted && failure.triedFor < kUdpLimit;
}

/// Whoever has the microphone may be about to let go of it: another program, or this one by another name.
bool RetryPolicy::isAboutToBeReleased(const Failure& failure) const {
  return !picture_ && failure.code == kDeviceBusy && failure.wantedFor <= kBusyPatience;
}

bool RetryPolicy::isWorthAnotherTry(const Failure& failure) const {
  if (!picture_) return true;
  return network_ && failure.everRan && failure.awayFor.value_or(0ms) + kLastTry < kNetworkLimit;
}

Milliseconds RetryPolicy::pauseAfter(const Failure& failure) const {
  if (failed_tries_ > kOftenTries) return kSeldomPause;
  if (!picture_) return kPause;
  const Milliseconds away = failure.awayFor.value_or(0ms);
  return away < 1s ? kSoonPause : std::clamp(kNetworkLimit - kLastTry - away, Milliseconds(100ms), kPause);
}

}  // namespace lmx
