// Cuts raw media along a capture's marks and feeds the movie with them.
#pragma once
#include <cstdint>
#include <deque>
#include <functional>
#include <optional>
#include <vector>

#include "capture/media/frame_cutter.h"
#include "capture/media/sound_cutter.h"
#include "capture/media_queue.h"
#include "capture/movie_output.h"
#include "capture/store/capture_marks.h"

namespace lmx {

/// Decides frame by frame whether it is recorded; sound follows the decisions on the picture. Where there is
/// only sound, virtual frames of 10 ms stand for the picture: the same cuts, the same clock. Recording
/// thread only.
class MediaCutter {
 public:
  /// What the cutter reads and writes; all of it must outlive the cutter.
  struct Surroundings {
    const CaptureMarks& marks;
    Journal& journal;
    MovieOutput& movie;
    /// A frame in the movie's size and colours; null when it can't be read.
    std::function<BufferHandle(const RawMedium& frame)> convert;
    std::function<void(const RawMedium& chunk)> heard;       ///< sound that is recorded
    std::function<void(double t, double seconds)> silenced;  ///< silence that is recorded instead
    std::function<bool()> soundComes;  ///< false while the microphone is away: nobody waits for it then
    bool live = true;                  ///< sound that is not there in time is silence
    std::function<double()> now = {};  ///< running time; without it, as far as frames have been decided
  };
  /// @param begin  running time at which the capture begins, seconds
  MediaCutter(const MovieEncoding& encoding, double begin, Surroundings surroundings);

  /// Frames ascend in time.
  void feedFrame(const RawMedium& frame);
  /// Chunks ascend in time. They are kept until the frames beside them have been decided.
  void feedSound(RawMedia chunks);
  /// Nothing has come for a while; `now` is the running time. Where there is only sound, silence goes on.
  void feedNothing(double now);
  /// Whether all frames before `end`, and the sound of those that were taken, have been fed.
  [[nodiscard]] bool reaches(double end) const;
  /// Gives the movie the sound that is left, and silence for what is missing. Live, the last frame lasts
  /// until `end` where so much is wanted: the sound beside a camera that is away is not lost. Nothing may be
  /// fed afterwards.
  void close(double end);

  [[nodiscard]] const FrameCutter& frames() const { return frames_; }
  /// Frames of the movie's clock that have been given to the movie.
  [[nodiscard]] std::uint32_t recordedFrames() const { return recorded_frames_; }
  /// Samples of each channel that have been given to the movie.
  [[nodiscard]] std::int64_t samples() const { return sound_ ? sound_->position() : 0; }
  /// Those of them that are silence in the place of missing sound.
  [[nodiscard]] std::uint64_t silentSamples() const { return sound_ ? sound_->silence() : 0; }

 private:
  struct Progress {
    double at = 0;  ///< running time
    double horizon = 0;
  };
  FrameDecision decide(double t);
  void prolong(double t);
  void feedVirtualFrames(double until);
  void cutChunk(const RawMedium& chunk);
  void pushPieces(const RawMedium& chunk, const std::vector<SoundPiece>& pieces);
  bool startMovie();
  void fillSilence(double until);
  double awaitedUntil();
  void pushSilence(std::uint32_t samples);
  void pushSound(const float* samples, std::uint32_t count);
  [[nodiscard]] double chunkSeconds(const RawMedium& chunk) const;
  [[nodiscard]] double endOf(const RawMedium& chunk) const { return chunk.time + chunkSeconds(chunk); }

  const bool has_video_;
  const double begin_;
  const std::optional<AudioEncoding> audio_;
  const Surroundings around_;
  FrameCutter frames_;
  std::optional<SoundCutter> sound_;
  RawMedia pending_sound_;
  std::deque<Progress> progress_;  ///< of the frames in the latest second; one entry is older
  double last_frame_time_ = -1e300;
  std::optional<double> next_virtual_;
  std::uint32_t recorded_frames_ = 0;
  std::int64_t pushed_samples_ = 0;
  bool key_owed_ = false;  ///< the frame that should have been a key frame could not be read
};

}  // namespace lmx
