// From the times of sound chunks to positions in the movie.
#include "capture/media/sound_cutter.h"

#include <algorithm>
#include <cmath>

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
    position_ = extent.end;
  }
  ++run_;
}

/// Places samples `first` to `last` of a chunk. The first of them belongs at position `target`.
SoundPiece SoundCutter::place(const Extent& run, std::int64_t target, std::int64_t first, std::int64_t last) {
  SoundPiece piece;
  std::int64_t from = first;
  const std::int64_t ahead = target - position_;
  if (ahead > tolerance_ || (ahead > 0 && position_ <= run.start)) {
    piece.silence = static_cast<std::uint32_t>(ahead);
    if (position_ > run.start) corrected_ += piece.silence;
  } else if (-ahead > tolerance_) {
    from = std::min(last, from - ahead);
    corrected_ += static_cast<std::uint64_t>(from - first);
  }
  // Never more than the run has room for: a tolerated offset must not push the next run away.
  const std::int64_t room = std::max<std::int64_t>(0, run.end - position_ - piece.silence);
  piece.offset = static_cast<std::uint32_t>(from);
  piece.count = static_cast<std::uint32_t>(std::max<std::int64_t>(0, std::min(last - from, room)));
  position_ += piece.silence + piece.count;
  return piece;
}

std::uint32_t SoundCutter::missingAtEnd() {
  if (frames_.runs().empty()) return 0;
  const std::int64_t missing = std::max<std::int64_t>(0, extentOf(frames_.runs().back()).end - position_);
  position_ += missing;
  return static_cast<std::uint32_t>(missing);
}

}  // namespace lmx
