// Sound to its places.
#include "capture/media/sound_cutter.h"

#include <gtest/gtest.h>

#include <cmath>
#include <random>

namespace lmx {
namespace {

constexpr double kFrame = 1.0 / 30.0;

/// Any frames, spans and chunk sizes: every recorded sample is the one that belongs there by its time stamp.
TEST(SoundCutter, PlacesEverySampleByItsTime) {
  std::mt19937 random(7);  // NOLINT: the same numbers every time
  for (int round = 0; round < 200; ++round) {
    const int rate = 48000;
    const std::uint32_t chunk = std::uniform_int_distribution<std::uint32_t>(100, 3000)(random);
    std::vector<bool> wanted(90);
    for (std::size_t n = 1; n < wanted.size(); ++n)
      wanted[n] = random() % 8 == 0 ? !wanted[n - 1] : wanted[n - 1];
    FrameCutter frames(kFrame);
    SoundCutter sound(frames, rate);
    std::vector<std::int64_t> out;  // sample number of the source, -1 for silence
    std::int64_t next = 0;
    const auto feed = [&](double horizon) {
      while (static_cast<double>(next + chunk) / rate <= horizon + 1e-6) {
        for (const SoundPiece& piece : sound.cut(static_cast<double>(next) / rate, chunk)) {
          out.insert(out.end(), piece.silence, -1);
          for (std::uint32_t i = 0; i < piece.count; ++i) out.push_back(next + piece.offset + i);
        }
        next += chunk;
      }
    };
    for (std::size_t n = 0; n < wanted.size(); ++n) {
      frames.decide(static_cast<double>(n) * kFrame, wanted[n], false);
      feed(frames.horizon());
    }
    frames.close();
    feed(10);
    out.insert(out.end(), sound.missingAtEnd(), -1);
    std::vector<std::int64_t> expected;
    for (std::size_t n = 0; n < wanted.size(); ++n) {
      if (!wanted[n]) continue;
      for (int i = 0; i < rate / 30; ++i) expected.push_back(static_cast<std::int64_t>(n) * rate / 30 + i);
    }
    ASSERT_EQ(out, expected) << "round " << round << ", chunks of " << chunk;
  }
}

TEST(SoundCutter, LateMicrophoneBeginsWithSilence) {
  FrameCutter frames(kFrame);
  SoundCutter sound(frames, 48000);
  for (int n = 0; n < 3; ++n) frames.decide(n * kFrame, true, false);
  const auto pieces = sound.cut(0.02, 480);
  ASSERT_EQ(pieces.size(), 1U);
  EXPECT_EQ(pieces[0], (SoundPiece{.silence = 960, .offset = 0, .count = 480}));
}

TEST(SoundCutter, WanderingClockIsCorrectedBeyondTheToleranceOnly) {
  FrameCutter frames(0.01);
  SoundCutter sound(frames, 48000, 0.015);
  double t = 0;
  for (int n = 0; n < 60000; ++n) {  // ten minutes; the microphone's second lasts 1.0002 of ours
    frames.decide(n * 0.01, true, false);
    while (t + 0.010002 <= frames.horizon()) {
      sound.cut(t, 480);
      t += 0.010002;
    }
    const double error = static_cast<double>(sound.position()) / 48000 - t;
    ASSERT_LT(std::abs(error), 0.0151);
  }
  EXPECT_NEAR(static_cast<double>(sound.corrected()) / 48000, 600 * 0.0002, 0.02);
}

}  // namespace
}  // namespace lmx
