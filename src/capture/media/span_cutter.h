// Cuts live picture and sound into one gapless movie: which frame, which samples, at which place? Pure.
#pragma once
#include <cstdint>
#include <functional>
#include <vector>

namespace lmx {

/// A run of frames that follow each other without a cut.
struct MovieRun {
  double sessionTime = 0;        ///< seconds of running time of its first frame
  std::uint32_t firstFrame = 0;  ///< its place in the movie
  std::uint32_t frames = 0;
  bool closed = false;
};

struct FrameDecision {
  bool take = false;
  bool forceKey = false;  ///< the frame must be a key frame
  bool beginsRun = false;
  std::uint32_t place = 0;  ///< frame number in the movie
};

/// Decides on frames: the movie's clock is the count of frames, so that cuts leave no gap and no rounding
/// adds up.
class FrameCutter {
 public:
  explicit FrameCutter(double frameSeconds) : frame_seconds_(frameSeconds) {}

  /// @param t  seconds of running time, ascending
  /// @param wanted  whether it is to be recorded
  /// @param keyWanted  whether a span begins with it inside a run
  FrameDecision decide(double t, bool wanted, bool keyWanted);
  /// Ends the run that is open, when nothing more will come.
  void close();

  /// Up to which running time everything is decided.
  [[nodiscard]] double horizon() const { return horizon_; }
  [[nodiscard]] std::uint32_t frames() const { return frames_; }
  [[nodiscard]] double frameSeconds() const { return frame_seconds_; }
  [[nodiscard]] const std::vector<MovieRun>& runs() const { return runs_; }

 private:
  double frame_seconds_;
  double horizon_ = -1e300;
  std::uint32_t frames_ = 0;
  std::vector<MovieRun> runs_;
};

/// Where sound goes: `silence` samples of nothing, then `count` samples of the chunk from sample `offset` on.
struct SoundPiece {
  std::uint32_t silence = 0;
  std::uint32_t offset = 0;
  std::uint32_t count = 0;
  bool operator==(const SoundPiece&) const = default;
};

/// Cuts sound along the runs of a FrameCutter. Sample positions follow from the time stamps; a source whose
/// clock wanders is corrected in one step once it is off by more than the tolerance, so that the offset to
/// the picture stays below it for ever.
class SoundCutter {
 public:
  SoundCutter(const FrameCutter& frames, std::uint32_t sampleRate, double toleranceSeconds = 0.015)
      : frames_(frames),
        rate_(sampleRate),
        tolerance_(static_cast<std::int64_t>(toleranceSeconds * sampleRate)) {}

  /// What to do with a chunk of `count` samples that begins at `t`. Call it when the horizon of the frames
  /// has reached the chunk's end; chunks ascending.
  std::vector<SoundPiece> cut(double t, std::uint32_t count);
  /// Silence that is missing at the end of the last closed run.
  std::uint32_t missingAtEnd();
  /// Samples placed so far.
  [[nodiscard]] std::int64_t position() const { return position_; }
  /// Samples inserted or left out to stay with the picture.
  [[nodiscard]] std::uint64_t corrected() const { return corrected_; }

 private:
  [[nodiscard]] std::int64_t sampleAt(double movieSeconds) const;
  void cutRun(std::size_t run, double t, std::uint32_t count, std::vector<SoundPiece>& pieces);

  const FrameCutter& frames_;
  std::uint32_t rate_;
  std::int64_t tolerance_;
  std::int64_t position_ = 0;
  std::size_t run_ = 0;  ///< first run that may still get sound
  std::uint64_t corrected_ = 0;
};

}  // namespace lmx
