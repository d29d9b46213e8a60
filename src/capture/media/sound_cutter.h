// Cuts live sound along the runs of a frame cutter. Pure.
#pragma once
#include <cstdint>
#include <vector>

#include "capture/media/frame_cutter.h"

namespace lmx {

/// What of a chunk of sound goes into the movie: first `silence` samples of nothing, then `count` samples of
/// the chunk from sample `offset` on.
struct SoundPiece {
  std::uint32_t silence = 0;
  std::uint32_t offset = 0;
  std::uint32_t count = 0;
  bool operator==(const SoundPiece&) const = default;
};

/// Sample positions follow from the time stamps. Sound whose times are continuous is never touched; a jump of
/// the times beyond the tolerance becomes silence, or sound that is left out. Not thread-safe.
class SoundCutter {
 public:
  /// @param frames  must outlive the cutter
  SoundCutter(const FrameCutter& frames, std::uint32_t sampleRate, double toleranceSeconds = 0.005)
      : frames_(frames),
        rate_(sampleRate),
        tolerance_(static_cast<std::int64_t>(toleranceSeconds * sampleRate)) {}

  /// What to do with a chunk of `count` samples that begins at running time `t`. Call it when the horizon of
  /// the frames has reached the chunk's end; chunks ascend.
  std::vector<SoundPiece> cut(double t, std::uint32_t count);
  /// Samples of silence to put in now so that the sound reaches running time `t`, as far as frames have been
  /// decided, whether or not any sound ever comes. They count as placed: sound that comes for them later is
  /// left out. A second's worth at most; call it until it returns 0.
  std::uint32_t missingBefore(double t);
  /// Samples of silence that are missing at the end of the last closed run. They count as placed afterwards.
  std::uint32_t missingAtEnd();
  /// Samples placed so far.
  [[nodiscard]] std::int64_t position() const { return position_; }
  /// Samples inserted or left out to stay with the picture.
  [[nodiscard]] std::uint64_t corrected() const { return corrected_; }
  /// Samples of silence placed so far, for whatever reason.
  [[nodiscard]] std::uint64_t silence() const { return silence_; }

 private:
  /// Half-open range of samples in the movie.
  struct Extent {
    std::int64_t start = 0;
    std::int64_t end = 0;
  };
  [[nodiscard]] std::int64_t sampleAt(double movieSeconds) const;
  [[nodiscard]] Extent extentOf(const MovieRun& run) const;
  void cutRun(std::size_t run, double t, std::uint32_t count, std::vector<SoundPiece>& pieces);
  [[nodiscard]] std::int64_t reachable(const MovieRun& run, double t) const;
  void fill(std::int64_t samples);
  SoundPiece place(const Extent& run, std::int64_t target, std::int64_t first, std::int64_t last);

  const FrameCutter& frames_;
  std::uint32_t rate_;
  std::int64_t tolerance_;
  std::int64_t position_ = 0;
  std::size_t run_ = 0;  ///< first run that may still get sound
  bool filled_ = false;  ///< the last samples are silence that waits for no sound
  std::uint64_t corrected_ = 0;
  std::uint64_t silence_ = 0;
};

}  // namespace lmx
