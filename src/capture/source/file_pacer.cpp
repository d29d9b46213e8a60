// Waits for the time at which a file's media are due.
#include "capture/source/file_pacer.h"

#include <algorithm>
#include <chrono>

#include "capture/source/capture_clock.h"

namespace lmx {
namespace {

constexpr double kShortestRound = 0.5;  // seconds: a file of one picture must not be opened all the time
constexpr double kMostBehind = 1.0;     // seconds

}  // namespace

std::optional<double> FilePacer::wait(double seconds, double duration) {
  std::unique_lock lock(mutex_);
  if (!round_start_) round_start_ = CaptureClock::now() - seconds;
  double due = *round_start_ + seconds;
  if (const double behind = CaptureClock::now() - due; behind > kMostBehind) {
    *round_start_ += behind;
    due += behind;
  }
  round_length_ = std::max(round_length_, seconds + duration);
  const auto left = std::chrono::duration<double>(due - CaptureClock::now());
  if (changed_.wait_for(lock, left, [this] { return interrupted_; })) return std::nullopt;
  return due;
}

void FilePacer::nextRound() {
  const std::lock_guard lock(mutex_);
  if (round_start_) *round_start_ += std::max(round_length_, kShortestRound);
  round_length_ = 0;
}

void FilePacer::interrupt() {
  const std::lock_guard lock(mutex_);
  interrupted_ = true;
  changed_.notify_all();
}

void FilePacer::resume() {
  const std::lock_guard lock(mutex_);
  interrupted_ = false;
}

bool FilePacer::played() const {
  const std::lock_guard lock(mutex_);
  return round_length_ > 0;
}

}  // namespace lmx
