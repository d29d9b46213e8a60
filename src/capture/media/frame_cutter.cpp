// From the times of live frames to their places in the movie.
#include "capture/media/frame_cutter.h"

#include <algorithm>
#include <cmath>

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

void FrameCutter::close() {
  if (!runs_.empty()) runs_.back().closed = true;
}

}  // namespace lmx
