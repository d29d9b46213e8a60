// A microphone's sound on the machine's clock.
#include "capture/source/steady_sound.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <complex>
#include <numeric>
#include <random>
#include <string>
#include <vector>

#include "tests/unit/capture/source/microphone.h"

namespace lmx {
namespace {

using testing::bufferOf;
using testing::Listener;
using testing::Microphone;

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

class SteadySoundForHours : public ::testing::TestWithParam<Case> {};

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

std::string nameOf(const ::testing::TestParamInfo<Case>& info) {
  static const std::array<std::string, 4> kJitter{"Punctual", "Uniform", "Bursts", "Hiccups"};
  const auto& [ppm, weather] = info.param;
  return (ppm < 0 ? "Minus" : "Plus") + std::to_string(std::abs(static_cast<int>(ppm))) + "Chunks" +
         std::to_string(weather.chunk) + kJitter.at(static_cast<std::size_t>(weather.jitter));
}

INSTANTIATE_TEST_SUITE_P(, SteadySoundForHours, ::testing::ValuesIn(kCases), nameOf);

TEST(SteadySound, AVeryBadClockIsFollowedAfterAMinute) {
  for (const double ppm : {-3000.0, 1000.0, 4000.0}) {
    SteadySound sound(8000, 2);
    Microphone microphone(8000, ppm, 25);
    Delivery delivery(8000, {480, Jitter::uniform});
    Listener start(8000, 25);
    record(sound, microphone, delivery, start, 60);
    Listener listener(8000, 25);
    record(sound, microphone, delivery, listener, 600);
    EXPECT_LT(listener.worst(), 0.005) << ppm;
    EXPECT_LT(start.worst(), 0.02) << ppm;
    EXPECT_EQ(sound.jumps(), 0U) << ppm;
  }
}

// ---- how it sounds

/// Greatest deviation from a pure tone within `samples`, in decibels of the tone: a click, a step, hiss. The
/// tone's pitch, loudness and place are those of the window itself.
double deviation(const std::vector<std::complex<double>>& window) {
  const auto mean = [&](double pitch) {
    std::complex<double> sum;
    for (std::size_t n = 0; n < window.size(); ++n) {
      sum += window[n] * std::polar(1.0, -pitch * static_cast<double>(n));
    }
    return sum / static_cast<double>(window.size());
  };
  // The pitch: how far the tone turns from the window's first to its second half.
  double pitch =
      std::arg(std::inner_product(window.begin() + 1, window.end(), window.begin(), std::complex<double>(),
                                  std::plus<>(), [](auto a, auto b) { return a * std::conj(b); }));
  const std::size_t half = window.size() / 2;
  for (int round = 0; round < 3; ++round) {
    std::complex<double> turn;
    for (std::size_t n = 0; n < half; ++n) {
      turn += window[n + half] * std::conj(window[n]) * std::polar(1.0, -pitch * static_cast<double>(half));
    }
    pitch += std::arg(turn) / static_cast<double>(half);
  }
  const std::complex<double> tone = mean(pitch);
  double worst = 0;
  for (std::size_t n = 0; n < window.size(); ++n) {
    worst = std::max(worst, std::abs(window[n] - tone * std::polar(1.0, pitch * static_cast<double>(n))));
  }
  return 20 * std::log10(worst / std::abs(tone));
}

std::vector<std::complex<double>> toneOf(double ppm, double frequency, Weather weather, double until) {
  SteadySound sound(48000, 2);
  Microphone microphone(48000, ppm, frequency);
  Delivery delivery(48000, weather);
  std::vector<std::complex<double>> tone;
  while (microphone.now() < until) {
    auto buffer = bufferOf(microphone.hear(delivery.nextSize()));
    for (const auto& chunk : sound.feed(std::move(buffer), delivery.arrivalOf(microphone.now()))) {
      const std::vector<float> samples = testing::samplesOf(chunk);
      for (std::size_t i = 0; i < samples.size(); i += 2) tone.emplace_back(samples[i + 1], samples[i]);
    }
  }
  return tone;
}

double worstDeviation(const std::vector<std::complex<double>>& tone, double from, double until) {
  double worst = -300;
  const auto last = static_cast<std::size_t>(until * 48000) - 960;
  for (auto i = static_cast<std::size_t>(from * 48000); i < last; i += 480) {
    worst = std::max(worst, deviation({&tone[i], &tone[i + 960]}));
  }
  return worst;
}

// In the first seconds the speed is found, and the pitch glides: within 20 ms that shows more, the higher the
// tone. A step of the sound by a hundredth of a sample would show above -45 dB in the tone of 9973 Hz.
TEST(SteadySound, AToneStaysPure) {
  struct Tone {
    double frequency, first, settled;  // Hz, dB, dB
  };
  for (const auto& [frequency, first, settled] : {Tone{997, -60, -85}, Tone{9973, -40, -65}}) {
    for (const double ppm : {-200.0, 50.0}) {
      const auto tone = toneOf(ppm, frequency, {0, Jitter::uniform}, 45);
      EXPECT_LT(worstDeviation(tone, 0.01, 30), first) << ppm << " ppm, " << frequency << " Hz";
      EXPECT_LT(worstDeviation(tone, 30, 40), settled) << ppm << " ppm, " << frequency << " Hz";
    }
  }
}

TEST(SteadySound, AllThatIsHeardPasses) {
  for (const double frequency : {40.0, 5000.0, 12000.0, 16000.0, 18000.0}) {
    const auto tone = toneOf(100, frequency, {480, Jitter::none}, 6);
    double power = 0;
    for (std::size_t i = 4800; i < tone.size(); ++i) power += std::norm(tone[i]);
    const double level = 10 * std::log10(power / static_cast<double>(tone.size() - 4800) / 0.25);
    EXPECT_NEAR(level, 0, 0.5) << frequency;
  }
}

// ---- what is missing

struct Gap {
  double seconds;
  Jitter jitter;
};

TEST(SteadySound, MissingSoundIsOneJump) {
  for (const auto& [seconds, jitter] :
       {Gap{0.05, Jitter::none}, Gap{0.05, Jitter::uniform}, Gap{0.3, Jitter::uniform}, Gap{1, Jitter::none},
        Gap{1, Jitter::uniform}, Gap{1, Jitter::bursts}, Gap{30, Jitter::uniform}}) {
    SteadySound sound(8000, 2);
    Microphone microphone(8000, 100, 25);
    Delivery delivery(8000, {480, jitter});
    Listener listener(8000, 25);
    record(sound, microphone, delivery, listener, 60);
    microphone.miss(static_cast<int>(seconds * 8000));
    record(sound, microphone, delivery, listener, 120);
    EXPECT_EQ(listener.gaps(0.0001), 1) << seconds;
    EXPECT_NEAR(listener.gap(), seconds, 0.005);
    EXPECT_LT(listener.worst(), 0.005) << seconds;
    EXPECT_LT(listener.overlap(), 1e-6);
    EXPECT_EQ(sound.jumps(), 1U);
    EXPECT_NEAR(sound.partsPerMillion(), 100, 10);
  }
}

// A sound server on a busy machine loses one cycle, and some more before the first loss is certain.
TEST(SteadySound, SoundBetweenTwoGapsKeepsItsPlace) {
  for (const double apart : {0.1, 0.3, 0.45, 0.6, 0.9}) {
    SteadySound sound(8000, 2);
    Microphone microphone(8000, 0, 25);
    Delivery delivery(8000, {480, Jitter::none});
    Listener listener(8000, 25);
    record(sound, microphone, delivery, listener, 30);
    for (int i = 0; i < 3; ++i) {
      microphone.miss(200);
      record(sound, microphone, delivery, listener, microphone.now() + apart);
    }
    record(sound, microphone, delivery, listener, 60);
    EXPECT_LT(listener.worst(), 0.005) << apart;
    EXPECT_LT(listener.overlap(), 1e-6) << apart;
    EXPECT_NEAR(listener.end(), 60, 0.2) << apart;
  }
}

TEST(SteadySound, AFewMissingSamplesAreMadeUpForWithoutAJump) {
  SteadySound sound(8000, 2);
  Microphone microphone(8000, 0, 25);
  Delivery delivery(8000, {480, Jitter::uniform});
  Listener before(8000, 25);
  record(sound, microphone, delivery, before, 60);
  microphone.miss(80);
  record(sound, microphone, delivery, before, 72);
  Listener after(8000, 25);
  record(sound, microphone, delivery, after, 100);
  EXPECT_LT(before.gap(), 1e-6);
  EXPECT_LT(before.worst(), 0.011);
  EXPECT_LT(after.worst(), 0.005);
}

// What is in the device's memory while nobody reads comes late, but it comes.
TEST(SteadySound, LateSoundThatCatchesUpIsNoGap) {
  for (const double stall : {0.1, 0.3, 0.7, 3.0}) {
    SteadySound sound(8000, 2);
    Microphone microphone(8000, 100, 25);
    Listener listener(8000, 25);
    while (microphone.now() < 60) {
      auto buffer = bufferOf(microphone.hear(80));
      const double there = microphone.now();
      const bool stalled = there > 30 && there <= 30 + stall;
      listener.listen(sound.feed(std::move(buffer), stalled ? 30 + stall : there));
    }
    EXPECT_LT(listener.worst(), 0.005) << stall;
    EXPECT_LT(listener.gap(), 1e-6) << stall;
    EXPECT_EQ(sound.jumps(), 0U) << stall;
  }
}

}  // namespace
}  // namespace lmx
