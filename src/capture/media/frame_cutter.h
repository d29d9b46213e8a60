// Decides which live frames go into the movie, and at which place. Pure.
#pragma once
#include <cstdint>
#include <vector>

namespace lmx {

/// A run of frames that follow each other without a cut.
struct MovieRun {
  double sessionTime = 0;        ///< running time of its first frame, seconds
  std::uint32_t firstFrame = 0;  ///< its place in the movie
  std::uint32_t frames = 0;
  bool closed = false;  ///< no frame will be added
};

struct FrameDecision {
  bool take = false;
  bool forceKey = false;  ///< the frame must be a key frame
  bool beginsRun = false;
  std::uint32_t place = 0;  ///< frame number in the movie
};

/// Cuts live pictures into one gapless movie. The movie's clock is the count of frames, so cuts leave no gap
/// and rounding errors do not add up. Not thread-safe.
class FrameCutter {
 public:
  explicit FrameCutter(double frameSeconds) : frame_seconds_(frameSeconds) {}

  /// @param t  running time of the frame, seconds; ascending from call to call
  /// @param wanted  whether it is to be recorded
  /// @param keyWanted  whether a request's span begins with it, inside a run
  FrameDecision decide(double t, bool wanted, bool keyWanted);
  /// Lets the newest frame of the open run, if there is one, last until `until` at least.
  void prolong(double until);
  /// Ends the open run. Call it when no more frames will come.
  void close();

  /// Running time up to which every frame has been decided; -1e300 before the first one.
  [[nodiscard]] double horizon() const { return horizon_; }
  /// Running time of a place in the movie, in seconds of the movie. Behind a cut's frames the next run
  /// begins.
  [[nodiscard]] double timeAt(double movieSeconds) const;
  /// Length of the movie so far, in frames.
  [[nodiscard]] std::uint32_t frames() const { return frames_; }
  [[nodiscard]] double frameSeconds() const { return frame_seconds_; }
  [[nodiscard]] const std::vector<MovieRun>& runs() const { return runs_; }

 private:
  double frame_seconds_;
  double horizon_ = -1e300;
  std::uint32_t frames_ = 0;
  std::vector<MovieRun> runs_;
};

}  // namespace lmx
