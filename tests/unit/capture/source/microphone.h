// A simulated microphone, and an ear that compares what SteadySound makes of it with what was played.
#pragma once
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <numbers>
#include <vector>

#include "capture/source/steady_sound.h"

namespace lmx::testing {

using Chunk = SteadySound::Chunk;

inline BufferHandle bufferOf(const std::vector<float>& samples) {
  ensureGStreamer();
  const std::size_t bytes = samples.size() * sizeof(float);
  BufferHandle buffer(gst_buffer_new_allocate(nullptr, bytes, nullptr));
  gst_buffer_fill(buffer.get(), 0, samples.data(), bytes);
  return buffer;
}

inline std::vector<float> samplesOf(const Chunk& chunk) {
  std::vector<float> samples(gst_buffer_get_size(chunk.buffer.get()) / sizeof(float));
  gst_buffer_extract(chunk.buffer.get(), 0, samples.data(), samples.size() * sizeof(float));
  return samples;
}

/// A microphone in front of a loudspeaker that plays a tone: sine left, cosine right. Any two samples tell
/// when they were heard.
class Microphone {
 public:
  Microphone(int rate, double ppm, double frequency)
      : rate_(rate * (1 + ppm * 1e-6)), turn_(2 * std::numbers::pi * frequency) {}

  std::vector<float> hear(int frames) {
    std::vector<float> samples;
    samples.reserve(static_cast<std::size_t>(frames) * 2);
    for (int i = 0; i < frames; ++i, ++heard_) {
      const double angle = turn_ * timeOf(heard_);
      samples.push_back(static_cast<float>(0.5 * std::sin(angle)));
      samples.push_back(static_cast<float>(0.5 * std::cos(angle)));
    }
    return samples;
  }
  /// Sound that is lost on the way.
  void miss(int frames) { heard_ += frames; }
  /// Running time now.
  [[nodiscard]] double now() const { return timeOf(heard_); }

 private:
  [[nodiscard]] double timeOf(std::int64_t n) const { return 3.7 + static_cast<double>(n) / rate_; }
  double rate_;
  double turn_;
  std::int64_t heard_ = 0;
};

/// Compares what was given out with the tone.
class Listener {
 public:
  Listener(int rate, double frequency) : rate_(rate), turn_(2 * std::numbers::pi * frequency) {}

  void listen(const std::vector<Chunk>& chunks) {
    for (const Chunk& chunk : chunks) {
      if (frames_ > 0) gaps_.push_back(chunk.time - end_);
      const std::vector<float> samples = samplesOf(chunk);
      for (std::size_t i = 0; i < samples.size(); i += 2) {
        hearFrame(chunk.time + static_cast<double>(i / 2) / rate_, samples[i], samples[i + 1]);
      }
      end_ = chunk.time + static_cast<double>(samples.size() / 2) / rate_;
    }
  }

  /// Greatest error of place, seconds, more than a second after the beginning.
  [[nodiscard]] double worst() const { return worst_; }
  /// Greatest step of the place from one sample to the next, seconds.
  [[nodiscard]] double roughest() const { return roughest_; }
  /// Greatest jump of the times.
  [[nodiscard]] double gap() const {
    return gaps_.empty() ? 0 : *std::max_element(gaps_.begin(), gaps_.end());
  }
  [[nodiscard]] double overlap() const {
    return gaps_.empty() ? 0 : -*std::min_element(gaps_.begin(), gaps_.end());
  }
  [[nodiscard]] auto gaps(double longerThan) const {
    return std::count_if(gaps_.begin(), gaps_.end(), [&](double gap) { return gap > longerThan; });
  }
  [[nodiscard]] std::int64_t frames() const { return frames_; }
  [[nodiscard]] double end() const { return end_; }

 private:
  void hearFrame(double t, float sine, float cosine) {
    const double error = std::remainder(turn_ * t - std::atan2(sine, cosine), 2 * std::numbers::pi) / turn_;
    if (frames_ == 0) begin_ = t;
    if (t > begin_ + 1) {
      worst_ = std::max(worst_, std::abs(error));
      roughest_ = std::max(roughest_, std::abs(error - last_error_));
    }
    last_error_ = error;
    ++frames_;
  }
  int rate_;
  double turn_;
  double begin_ = 0;
  double end_ = 0;
  double worst_ = 0;
  double roughest_ = 0;
  double last_error_ = 0;
  std::int64_t frames_ = 0;
  std::vector<double> gaps_;
};

}  // namespace lmx::testing
