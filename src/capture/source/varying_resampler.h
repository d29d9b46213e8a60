// Resamples sound by a ratio that may change at any time, without a step in the sound.
#pragma once
#include <gst/audio/audio.h>

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "capture/gst/gst_handles.h"

namespace lmx {

/// GStreamer's resampler (windowed sinc with interpolated taps), with its position in the input. Samples are
/// 32-bit floats, interleaved. Not thread-safe.
class VaryingResampler {
 public:
  VaryingResampler(int sampleRate, int channels);

  /// @param inputPerOutput  samples that are read for one that is made; 0.9 to 1.1
  void setRatio(double inputPerOutput);
  /// Takes all of `input` in.
  /// @param input  whole frames
  /// @return what could be made of it, a buffer of whole frames; null when that is nothing yet
  [[nodiscard]] BufferHandle push(std::span<const float> input);
  /// What is left of the input, as if silence followed. Call restart() before the next push().
  [[nodiscard]] BufferHandle drain();
  /// Forgets the input so far and counts anew.
  void restart();

  /// Place in the input, in frames since restart(), of the next frame that will be made. The filter needs
  /// some frames beyond it: that is the latency.
  [[nodiscard]] double position() const;
  /// Frames of input that must follow a place before it is made.
  [[nodiscard]] std::size_t latency() const;

 private:
  [[nodiscard]] BufferHandle resample(const float* input, std::size_t frames);
  struct Free {
    void operator()(GstAudioResampler* resampler) const noexcept { gst_audio_resampler_free(resampler); }
  };
  const std::size_t channels_;
  std::int64_t ratio_;
  std::int64_t position_ = 0;  ///< in frames times the ratio's denominator
  std::unique_ptr<GstAudioResampler, Free> resampler_;
};

}  // namespace lmx
