// Puts a microphone's sound on the machine's clock.
#pragma once
#include <cstdint>
#include <vector>

#include "capture/gst/gst_handles.h"
#include "capture/source/arrival_judge.h"
#include "capture/source/varying_resampler.h"

namespace lmx {

/// Puts a microphone's sound on the machine's clock: its own clock is off by up to some hundred parts in a
/// million, and its chunks arrive late, in bursts and after hiccups. The filtered arrival times say where the
/// sound belongs, and the sound is resampled all the time so that it stays there: no step, no click. Sound
/// that is missing is one jump of the times.
///
/// For live microphones only; files and synthetic devices have times of their own.
///
/// Sound is given out as it comes, but for 24 samples that the filter holds (their time is accounted for in
/// the times of the chunks), the first 0.25 s, which set the clock, and sound that is more than 18 ms late:
/// it waits for at most 0.8 s until it is known whether sound before it is missing. A change of place of up
/// to 50 ms is made up for by at most 5 ms in a second.
///
/// Whatever a device delivers, at most four seconds are held, and the times ascend: sound that comes faster
/// than time passes is left out. One warning tells of that. Not thread-safe (one streaming thread).
class SteadySound {
 public:
  struct Chunk {
    BufferHandle buffer;  ///< 32-bit float samples, interleaved
    double time = 0;      ///< running time of its first sample, seconds
  };
  explicit SteadySound(int sampleRate = 48000, int channels = 2);

  /// @param buffer  32-bit float samples, interleaved, as the device gave them; they are copied
  /// @param arrival  running time, in seconds, at which its last sample was there
  /// @return what can be passed on, possibly nothing yet. Each chunk begins where the one before it ended,
  /// but for real gaps.
  std::vector<Chunk> feed(BufferHandle buffer, double arrival);

  /// How much faster the microphone's clock runs than the machine's, parts in a million.
  [[nodiscard]] double partsPerMillion() const { return (1 - clock().secondsPerSecond()) * 1e6; }
  /// Jumps of the times so far, the start not counted.
  [[nodiscard]] std::uint32_t jumps() const { return jumps_; }

 private:
  [[nodiscard]] const ClockFilter& clock() const { return judge_.clock(); }
  [[nodiscard]] double seconds(std::int64_t frames) const {
    return static_cast<double>(frames) / sample_rate_;
  }
  [[nodiscard]] std::int64_t heldFrames() const;
  [[nodiscard]] std::int64_t copySamples(GstBuffer* buffer);
  [[nodiscard]] bool plausible(double arrival);
  [[nodiscard]] ArrivalJudge::Finding judge(const SoundStamp& stamp);
  /// Seconds by which the next sound would be given out before its time.
  [[nodiscard]] double behind() const;
  void boundHeld();
  void jump(double arrival, std::vector<Chunk>& chunks);
  void release(const SoundStamp& last, std::vector<Chunk>& chunks);
  [[nodiscard]] bool beginPart();
  void dropHeld(std::int64_t frames);
  void adjustRatio(std::size_t frames);
  void give(BufferHandle buffer, std::vector<Chunk>& chunks);
  void countJump(double arrival);

  const double sample_rate_;
  const std::size_t channels_;
  ArrivalJudge judge_;
  VaryingResampler resampler_;
  std::vector<float> held_;            ///< what the judge has not decided about
  std::vector<SoundStamp> undecided_;  ///< of what is held
  std::int64_t heard_ = 0;             ///< frames that have come from the microphone
  double last_arrival_ = -1e300;       ///< as it was said to be
  bool part_open_ = false;             ///< the next sound follows what was given out
  std::int64_t part_begin_ = 0;        ///< number, among those that came, of the part's first frame
  double part_time_ = -1e300;          ///< running time of the part's first frame
  double ratio_ = 1;                   ///< frames read for one that is given out
  std::int64_t part_frames_ = 0;       ///< given out of the part
  std::uint32_t jumps_ = 0;
  std::uint32_t recent_jumps_ = 0;
  double jumps_since_ = -1e300;
  bool warned_ = false;
};

}  // namespace lmx
