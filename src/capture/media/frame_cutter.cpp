// From the times of live frames to their places in the movie.
#include "capture/media/frame_cutter.h"

#include <algorithm>
#include <cmath>
#include <iterator>

namespace lmx {

FrameDecision FrameCutter::decide(double t, bool wanted, bool keyWanted) {
  FrameDecision decision;
  horizon_ = std::max(horizon_, t + frame_seconds_);
  if (!wanted) {
    close();
    return decision;
  }
  if (runs_.empty() || runs_.back().closed) {
    runs_.push_back({.sessionTime = t, .firstFrame = frames_});
    decision.beginsRun = true;
  }
  MovieRun& run = runs_.back();
  const auto k = std::llround((t - run.sessionTime) / frame_seconds_);
  if (k < run.frames) return decision;  // a second frame for the same place
  decision.take = true;
  decision.forceKey = decision.beginsRun || keyWanted;
  decision.place = run.firstFrame + static_cast<std::uint32_t>(k);
  run.frames = static_cast<std::uint32_t>(k) + 1;
  frames_ = decision.place + 1;
  return decision;
}

void FrameCutter::prolong(double until) {
  if (runs_.empty() || runs_.back().closed) return;
  MovieRun& run = runs_.back();
  // Frames that come in time already reach the nearest place: nothing happens to them.
  const auto frames = std::llround((until - run.sessionTime) / frame_seconds_);
  if (frames <= run.frames) return;
  run.frames = static_cast<std::uint32_t>(frames);
  frames_ = run.firstFrame + run.frames;
}

void FrameCutter::close() {
  if (!runs_.empty()) runs_.back().closed = true;
}

double FrameCutter::timeAt(double movieSeconds) const {
  const double place = movieSeconds / frame_seconds_;
  constexpr double kRounding = 1e-3;  // frames: samples begin beside frames
  const auto next = std::upper_bound(
      runs_.begin(), runs_.end(), place + kRounding,
      [](double wanted, const MovieRun& run) { return wanted < static_cast<double>(run.firstFrame); });
  if (next == runs_.begin()) return movieSeconds;
  const MovieRun& run = *std::prev(next);
  return run.sessionTime + (place - run.firstFrame) * frame_seconds_;
}

}  // namespace lmx
