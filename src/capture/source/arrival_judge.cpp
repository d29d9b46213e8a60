// Decides about late sound.
#include "capture/source/arrival_judge.h"

namespace lmx {
namespace {

/// All in seconds. Sound that is later than this is held back. The least that a sound server loses is a cycle
/// of 21 ms, as a rule, and the clock may be a little late; the sound of a very slow clock is never on time.
constexpr double kLate = 0.018;
/// No scheduler makes sound early: the clock was wrong, or the microphone delivers nonsense.
constexpr double kEarly = -0.050;
/// At the start the clock is set to the earliest arrival of this time.
constexpr double kStart = 0.250;
/// Sound that is late and has not caught up for this long will not catch up.
constexpr double kSteadilyLate = 0.500;
constexpr double kCatchingUp = 0.005;
/// Users fill up with silence what lags for a second.
constexpr double kLongestWait = 0.800;

}  // namespace

ArrivalJudge::Finding ArrivalJudge::judge(const SoundStamp& stamp) {
  if (!running_ && !wait_) beginWait(stamp, true);
  if (!wait_) {
    const double late = clock_.lateness(stamp);
    if (late < kEarly) return startAgain(stamp);
    if (late <= kLate) {
      clock_.observe(stamp);
      return Finding::inTime;
    }
    beginWait(stamp, false);
  }
  return keepWaiting(stamp);
}

void ArrivalJudge::beginWait(const SoundStamp& stamp, bool starting) {
  if (starting) clock_.restart(stamp);
  wait_ = {.earliest = stamp, .since = stamp.arrival, .last_fall = stamp.arrival, .starting = starting};
}

ArrivalJudge::Finding ArrivalJudge::keepWaiting(const SoundStamp& stamp) {
  const double gained = clock_.lateness(wait_->earliest) - clock_.lateness(stamp);
  if (gained > kCatchingUp) wait_->last_fall = stamp.arrival;
  if (gained > 0) wait_->earliest = stamp;
  const double waited = stamp.arrival - wait_->since;
  if (wait_->starting) return waited < kStart ? Finding::undecided : startAgain(wait_->earliest);
  if (clock_.lateness(stamp) <= kLate) {
    wait_.reset();
    return judge(stamp);
  }
  if (waited < kLongestWait && stamp.arrival - wait_->last_fall < kSteadilyLate) return Finding::undecided;
  return startAgain(wait_->earliest);
}

ArrivalJudge::Finding ArrivalJudge::startAgain(const SoundStamp& stamp) {
  clock_.restart(stamp);
  punctual_ = stamp;
  wait_.reset();
  running_ = true;
  return Finding::jump;
}

}  // namespace lmx
