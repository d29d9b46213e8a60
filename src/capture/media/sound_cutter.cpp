// From the times of sound chunks to positions in the movie.
#include "capture/media/sound_cutter.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace lmx {

std::int64_t SoundCutter::sampleAt(double movieSeconds) const {
  return std::llround(movieSeconds * static_cast<double>(rate_));
}

SoundCutter::Extent SoundCutter::extentOf(const MovieRun& run) const {
  const double frame = frames_.frameSeconds();
  return {sampleAt(run.firstFrame * frame), sampleAt((run.firstFrame + run.frames) * frame)};
}

std::vector<SoundPiece> SoundCutter::cut(double t, std::uint32_t count) {
  std::vector<SoundPiece> pieces;
  for (std::size_t i = run_; i < frames_.runs().size(); ++i) cutRun(i, t, count, pieces);
  return pieces;
}

void SoundCutter::cutRun(std::size_t number, double t, std::uint32_t count, std::vector<SoundPiece>& pieces) {
  const MovieRun& run = frames_.runs()[number];
  const Extent extent = extentOf(run);
  // Where the chunk's first sample would go if the whole chunk belonged to this run.
  const std::int64_t chunk = extent.start + std::llround((t - run.sessionTime) * static_cast<double>(rate_));
  const std::int64_t first = std::max<std::int64_t>(0, extent.start - chunk);
  const std::int64_t last = std::min<std::int64_t>(count, extent.end - chunk);
  if (first < last) {
    const SoundPiece piece = place(extent, chunk + first, first, last);
    if (piece.silence > 0 || piece.count > 0) pieces.push_back(piece);
  }
  const bool past = chunk + static_cast<std::int64_t>(count) >= extent.end;
  if (!run.closed || !past || number != run_) return;
  if (position_ < extent.end) {
    pieces.push_back({.silence = static_cast<std::uint32_t>(extent.end - position_)});
    fill(extent.end - position_);
  }
  ++run_;
}

/// Places samples `first` to `last` of a chunk. The first of them belongs at position `target`.
SoundPiece SoundCutter::place(const Extent& run, std::int64_t target, std::int64_t first, std::int64_t last) {
  SoundPiece piece;
  std::int64_t from = first;
  const std::int64_t ahead = target - position_;
  // Only sound that follows sound may be off a little: then it goes on without a seam.
  const std::int64_t tolerance = filled_ || position_ <= run.start ? 0 : tolerance_;
  if (ahead > tolerance) {
    piece.silence = static_cast<std::uint32_t>(ahead);
    if (position_ > run.start) corrected_ += piece.silence;
  } else if (-ahead > tolerance) {
    from = std::min(last, from - ahead);
    corrected_ += static_cast<std::uint64_t>(from - first);
  }
  // Never more than the run has room for: a tolerated offset must not push the next run away.
  const std::int64_t room = std::max<std::int64_t>(0, run.end - position_ - piece.silence);
  piece.offset = static_cast<std::uint32_t>(from);
  piece.count = static_cast<std::uint32_t>(std::max<std::int64_t>(0, std::min(last - from, room)));
  fill(piece.silence);
  position_ += piece.count;
  if (piece.count > 0) filled_ = false;
  return piece;
}

void SoundCutter::fill(std::int64_t samples) {
  position_ += samples;
  silence_ += static_cast<std::uint64_t>(samples);
  filled_ = filled_ || samples > 0;
}

/// Position in the movie of running time `t`, or the end of the run's frames if that is earlier.
std::int64_t SoundCutter::reachable(const MovieRun& run, double t) const {
  const Extent extent = extentOf(run);
  const double samples = std::round((t - run.sessionTime) * static_cast<double>(rate_));
  const auto length = static_cast<double>(extent.end - extent.start);
  return extent.start + static_cast<std::int64_t>(std::min(samples, length));
}

std::uint32_t SoundCutter::missingBefore(double t) {
  std::int64_t target = position_;
  for (std::size_t i = run_; i < frames_.runs().size() && frames_.runs()[i].sessionTime < t; ++i) {
    target = std::max(target, reachable(frames_.runs()[i], t));
  }
  const std::int64_t missing = std::min<std::int64_t>(target - position_, rate_);
  fill(missing);
  return static_cast<std::uint32_t>(missing);
}

std::uint32_t SoundCutter::missingAtEnd() {
  std::uint32_t missing = 0;
  while (const std::uint32_t more = missingBefore(std::numeric_limits<double>::infinity())) missing += more;
  return missing;
}

}  // namespace lmx
