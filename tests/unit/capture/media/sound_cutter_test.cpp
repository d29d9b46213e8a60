// Sound to its places.
#include "capture/media/sound_cutter.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <random>
#include <vector>

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

// ---- sound that lags

constexpr int kRate = 48000;

/// A capture of 1/30 s frames beside which sound is late or missing. Keeps which sample came to which place.
class LaggingSound {
 public:
  /// One frame, then silence for what lags for more than a second.
  void frame(bool wanted) {
    const double t = frame_ * kFrame;
    frames_.decide(t, wanted, false);
    if (wanted) expected_.push_back(frame_);
    ++frame_;
    while (const std::uint32_t missing = sound_.missingBefore(t - 1)) {
      EXPECT_LE(missing, static_cast<std::uint32_t>(kRate));
      out_.insert(out_.end(), missing, -1);
    }
  }
  /// The next `count` samples of the microphone are there.
  void hear(std::uint32_t count) {
    for (const SoundPiece& piece : sound_.cut(static_cast<double>(next_) / kRate, count)) {
      out_.insert(out_.end(), piece.silence, -1);
      for (std::uint32_t i = 0; i < piece.count; ++i) out_.push_back(next_ + piece.offset + i);
    }
    next_ += count;
  }
  void miss(std::int64_t count) { next_ += count; }
  [[nodiscard]] std::int64_t next() const { return next_; }
  [[nodiscard]] double horizon() const { return frames_.horizon(); }
  [[nodiscard]] std::int64_t silent() const { return std::count(out_.begin(), out_.end(), -1); }
  /// Ends the movie; each sample must be silence or the one that was heard with that frame.
  void finish() {
    frames_.close();
    out_.insert(out_.end(), sound_.missingAtEnd(), -1);
    ASSERT_EQ(out_.size(), expected_.size() * kRate / 30);
    for (std::size_t i = 0; i < out_.size(); ++i) {
      const std::int64_t right =
          expected_[i / 1600] * std::int64_t{1600} + static_cast<std::int64_t>(i % 1600);
      ASSERT_TRUE(out_[i] == -1 || out_[i] == right)
          << "sample " << i << ": " << out_[i] << ", not " << right;
    }
    EXPECT_EQ(sound_.silence(), static_cast<std::uint64_t>(silent()));
  }

 private:
  FrameCutter frames_{kFrame};
  SoundCutter sound_{frames_, kRate};
  std::vector<std::int64_t> out_;  // sample number of the microphone, -1 for silence
  std::vector<int> expected_;      // numbers of the frames that were taken
  int frame_ = 0;
  std::int64_t next_ = 0;
};

struct Lag {
  const char* what;
  double from, until;         // seconds without sound, of ten
  double delay;               // after `until`, seconds, before the sound of that time comes
  double silence, tolerance;  // seconds of it in the movie
};

TEST(SoundCutter, SilenceIsPutInOnceSoundLagsASecond) {
  for (const Lag& lag :
       {Lag{"none at all", 0, 11, 0, 10, 0}, Lag{"it begins in the middle", 0, 5, 0, 5, 0},
        Lag{"a gap of two seconds", 4, 6, 0, 2, 0}, Lag{"a gap of half a second", 4, 4.5, 0, 0.5, 0},
        Lag{"half a second late", 0, 0, 0.5, 0, 0}, Lag{"two seconds late from four on", 4, 4, 2, 6, 0.05},
        Lag{"three seconds late at the start", 0, 0, 3, 10, 0.05}}) {
    LaggingSound capture;
    for (int n = 0; n < 300; ++n) {
      capture.frame(true);
      while (true) {
        const double t = static_cast<double>(capture.next()) / kRate;
        if (t >= lag.from && t < lag.until) {
          capture.miss(480);
        } else if (t + 0.01 <= (t < lag.from ? capture.horizon() : capture.horizon() - lag.delay) + 1e-6) {
          capture.hear(480);
        } else {
          break;
        }
      }
    }
    ASSERT_NO_FATAL_FAILURE(capture.finish()) << lag.what;
    const double end = lag.delay > 0 && lag.delay < 1 ? lag.delay : 0;  // never came
    EXPECT_NEAR(static_cast<double>(capture.silent()) / kRate, lag.silence + end, lag.tolerance + 0.011)
        << lag.what;
  }
}

TEST(SoundCutter, PiecesOfSilenceAreASecondAtMost) {
  FrameCutter frames(kFrame);
  SoundCutter sound(frames, kRate);
  EXPECT_EQ(sound.missingBefore(100), 0U);
  for (int n = 0; n < 75; ++n) frames.decide(n * kFrame, true, false);
  EXPECT_EQ(sound.missingBefore(-1), 0U);
  EXPECT_EQ(sound.missingBefore(0.5), 24000U);
  EXPECT_EQ(sound.missingBefore(0.5), 0U);
  EXPECT_EQ(sound.missingBefore(100), 48000U);
  EXPECT_EQ(sound.missingBefore(100), 48000U);
  EXPECT_EQ(sound.missingBefore(100), 0U);
}

// Pauses, losses and delays of any kind: what is there is in its place, and nothing is there twice.
TEST(SoundCutter, LateSoundIsNeverDoubledOrMoved) {
  std::mt19937 random(3);  // NOLINT: the same numbers every time
  const auto oneIn = [&random](unsigned n) { return random() % n == 0; };
  for (int round = 0; round < 100; ++round) {
    LaggingSound capture;
    bool wanted = true;
    double delay = 0;
    for (int n = 0; n < 300; ++n) {
      if (oneIn(20)) wanted = !wanted;
      if (oneIn(40)) delay = std::uniform_real_distribution(0.0, 3.0)(random);
      if (oneIn(60)) capture.miss(std::uniform_int_distribution<std::int64_t>(0, 100000)(random));
      capture.frame(wanted);
      while (true) {
        const auto count = std::uniform_int_distribution<std::uint32_t>(100, 3000)(random);
        if (static_cast<double>(capture.next() + count) / kRate > capture.horizon() - delay) break;
        capture.hear(count);
      }
    }
    ASSERT_NO_FATAL_FAILURE(capture.finish()) << "round " << round;
  }
}

}  // namespace
}  // namespace lmx
