// Frames and samples to their places in the movie.
#include "capture/media/span_cutter.h"

#include <algorithm>
#include <cmath>

namespace lmx {

FrameDecision FrameCutter::decide(double t, bool wanted, bool keyWanted) {
  FrameDecision decision;
  const bool open = !runs_.empty() && !runs_.back().closed;
  horizon_ = std::max(horizon_, t + frame_seconds_);
  if (!wanted) {
    if (open) runs_.back().closed = true;
    return decision;
  }
  if (!open) {
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

std::int64_t SoundCutter::sampleAt(double movieSeconds) const {
  return std::llround(movieSeconds * static_cast<double>(rate_));
}

std::vector<SoundPiece> SoundCutter::cut(double t, std::uint32_t count) {
  std::vector<SoundPiece> pieces;
  for (std::size_t i = run_; i < frames_.runs().size(); ++i) cutRun(i, t, count, pieces);
  return pieces;
}

void SoundCutter::cutRun(std::size_t number, double t, std::uint32_t count, std::vector<SoundPiece>& pieces) {
  const MovieRun& run = frames_.runs()[number];
  const double frame = frames_.frameSeconds();
  const std::int64_t runStart = sampleAt(run.firstFrame * frame);
  const std::int64_t runEnd = sampleAt((run.firstFrame + run.frames) * frame);
  // Where the chunk's first sample would go if it belonged to this run altogether.
  const std::int64_t place = runStart + std::llround((t - run.sessionTime) * static_cast<double>(rate_));
  const std::int64_t first = std::max<std::int64_t>(0, runStart - place);
  std::int64_t last = std::min<std::int64_t>(count, runEnd - place);
  const bool past = place + static_cast<std::int64_t>(count) >= runEnd;
  if (first < last) {
    SoundPiece piece;
    const std::int64_t target = place + first;
    std::int64_t from = first;
    const std::int64_t ahead = target - position_;
    if (ahead > tolerance_ || (ahead > 0 && position_ <= runStart)) {
      piece.silence = static_cast<std::uint32_t>(ahead);
      if (position_ > runStart) corrected_ += piece.silence;
    } else if (-ahead > tolerance_) {
      from = std::min(last, from - ahead);
      corrected_ += static_cast<std::uint64_t>(from - first);
    }
    // Never more than the run has room for: a tolerated offset must not push the next run away.
    last = std::min(last, from + std::max<std::int64_t>(0, runEnd - position_ - piece.silence));
    piece.offset = static_cast<std::uint32_t>(from);
    piece.count = static_cast<std::uint32_t>(std::max<std::int64_t>(0, last - from));
    position_ += piece.silence + piece.count;
    if (piece.silence > 0 || piece.count > 0) pieces.push_back(piece);
  }
  if (run.closed && past && number == run_) {
    if (position_ < runEnd) {
      pieces.push_back({.silence = static_cast<std::uint32_t>(runEnd - position_)});
      position_ = runEnd;
    }
    ++run_;
  }
}

std::uint32_t SoundCutter::missingAtEnd() {
  if (frames_.runs().empty()) return 0;
  const MovieRun& run = frames_.runs().back();
  const std::int64_t end = sampleAt((run.firstFrame + run.frames) * frames_.frameSeconds());
  const std::int64_t missing = std::max<std::int64_t>(0, end - position_);
  position_ += missing;
  return static_cast<std::uint32_t>(missing);
}

}  // namespace lmx
