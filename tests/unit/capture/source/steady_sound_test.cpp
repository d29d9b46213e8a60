// A microphone's sound on the machine's clock.
#include "capture/source/steady_sound.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <functional>
#include <limits>
#include <numbers>
#include <random>
#include <string>
#include <vector>

namespace lmx {
namespace {

using Chunk = SteadySound::Chunk;

BufferHandle bufferOf(const std::vector<float>& samples) {
  ensureGStreamer();
  const std::size_t bytes = samples.size() * sizeof(float);
  BufferHandle buffer(gst_buffer_new_allocate(nullptr, bytes, nullptr));
  gst_buffer_fill(buffer.get(), 0, samples.data(), bytes);
  return buffer;
}

std::vector<float> samplesOf(const Chunk& chunk) {
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

enum class Jitter { none, uniform, bursts, hiccups };
/// Frames of a chunk, for 48,000 a second; 0: irregular.
struct Weather {
  int chunk;
  Jitter jitter;
};

/// Delivers a microphone's chunks late in one of several ways.
class Delivery {
 public:
  Delivery(int rate, Weather weather) : rate_(rate), weather_(weather) {}

  int nextSize() {
    const int frames = weather_.chunk > 0 ? weather_.chunk : std::uniform_int_distribution(48, 2400)(random_);
    return std::max(1, static_cast<int>(static_cast<std::int64_t>(frames) * rate_ / 48000));
  }
  double arrivalOf(double there) {
    ++count_;
    switch (weather_.jitter) {
      case Jitter::none:
        return there;
      case Jitter::uniform:
        return last_ = std::max(last_, there + std::uniform_real_distribution(0.0, 0.012)(random_));
      case Jitter::bursts:
      case Jitter::hiccups:
        break;
    }
    // Every five minutes nothing comes for 300 ms.
    const double stall = std::floor(there / 300) * 300 + 150;
    return there >= stall && there < stall + 0.3 ? stall + 0.3 + 1e-4 * (count_ % 100) : there + 0.001;
  }
  /// Chunks of a burst come with the last of them.
  [[nodiscard]] int chunksAtOnce() const { return weather_.jitter == Jitter::bursts ? 3 : 1; }

 private:
  int rate_;
  Weather weather_;
  std::mt19937 random_{5};  // NOLINT: the same numbers every time
  double last_ = 0;
  int count_ = 0;
};

void record(SteadySound& sound, Microphone& microphone, Delivery& delivery, Listener& listener,
            double until) {
  while (microphone.now() < until) {
    std::vector<BufferHandle> chunks;
    double there = 0;
    for (int i = 0; i < delivery.chunksAtOnce(); ++i) {
      chunks.push_back(bufferOf(microphone.hear(delivery.nextSize())));
      there = microphone.now();
    }
    for (BufferHandle& chunk : chunks)
      listener.listen(sound.feed(std::move(chunk), delivery.arrivalOf(there)));
  }
}

constexpr int kLowRate = 500;  // nothing but the quality of the sound depends on the rate

struct Case {
  double ppm;
  Weather weather;
};

class SteadySoundForHours : public testing::TestWithParam<Case> {};

TEST_P(SteadySoundForHours, StaysWithinFiveMilliseconds) {
  const auto [ppm, weather] = GetParam();
  SteadySound sound(kLowRate, 2);
  Microphone microphone(kLowRate, ppm, 25);
  Delivery delivery(kLowRate, weather);
  Listener listener(kLowRate, 25);
  record(sound, microphone, delivery, listener, 3 * 3600);
  EXPECT_LT(listener.worst(), 0.005);
  EXPECT_LT(listener.gap(), 1e-6);
  EXPECT_LT(listener.overlap(), 1e-6);
  EXPECT_EQ(sound.jumps(), 0U);
  EXPECT_NEAR(sound.partsPerMillion(), ppm, 5);
  EXPECT_GT(listener.end(), 3 * 3600 - 1);
}

constexpr std::array kCases{
    Case{-200, {0, Jitter::uniform}}, Case{-200, {1024, Jitter::bursts}}, Case{-50, {480, Jitter::hiccups}},
    Case{-50, {0, Jitter::uniform}},  Case{50, {1024, Jitter::bursts}},   Case{50, {480, Jitter::uniform}},
    Case{200, {0, Jitter::uniform}},  Case{200, {480, Jitter::hiccups}},
};

std::string nameOf(const testing::TestParamInfo<Case>& info) {
  static const std::array<std::string, 4> kJitter{"Punctual", "Uniform", "Bursts", "Hiccups"};
  const auto& [ppm, weather] = info.param;
  return (ppm < 0 ? "Minus" : "Plus") + std::to_string(std::abs(static_cast<int>(ppm))) + "Chunks" +
         std::to_string(weather.chunk) + kJitter.at(static_cast<std::size_t>(weather.jitter));
}

INSTANTIATE_TEST_SUITE_P(, SteadySoundForHours, testing::ValuesIn(kCases), nameOf);

}  // namespace
}  // namespace lmx
