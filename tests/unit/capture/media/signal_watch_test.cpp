// Signal trouble.
#include "capture/media/signal_watch.h"

#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <numbers>
#include <random>

namespace lmx {
namespace {

constexpr int kRate = 48000;

/// What is on the sensor at second `n`.
using Scene = std::function<void(std::vector<std::uint8_t>& luma, int n)>;
constexpr std::size_t kWidth = 320;
constexpr std::size_t kHeight = 180;
constexpr std::size_t kStride = 384;

Scene even(std::uint8_t level) {
  return [level](auto& luma, int) { std::fill(luma.begin(), luma.end(), level); };
}

/// A camera's picture: still, but for its noise.
Scene noisy(int level, int noise) {
  return [level, noise](auto& luma, int n) {
    std::minstd_rand random(static_cast<unsigned>(n) + 1);
    for (auto& point : luma) {
      point =
          static_cast<std::uint8_t>(level + static_cast<int>(random() % static_cast<unsigned>(noise + 1)));
    }
  };
}

/// One scene until second `change`, then another.
Scene then(const Scene& first, int change, const Scene& second) {
  return [=](auto& luma, int n) { n < change ? first(luma, n) : second(luma, n); };
}

/// "black+12" begins after twelve seconds, "black-20" is over after having lasted 20 seconds.
std::string told(const SignalEvents& events, double t) {
  static constexpr const char* kNames[] = {"silence", "clipping", "black", "frozen"};
  std::string text;
  for (const SignalEvent& event : events) {
    text += std::string(text.empty() ? "" : " ") + kNames[static_cast<int>(event.trouble)] +
            (event.begins ? "+" + std::to_string(std::lround(t))
                          : "-" + std::to_string(std::lround(event.seconds)));
  }
  return text;
}

std::string watchPictures(const Scene& scene, const SignalThresholds& thresholds = {}, int seconds = 60) {
  SignalWatch watch(thresholds);
  std::string all;
  std::vector<std::uint8_t> luma(kStride * kHeight);
  for (int frame = 0; frame < seconds * 5; ++frame) {
    const double t = 100 + frame * 0.2;
    if (!watch.wantsPicture(t)) continue;
    scene(luma, frame / 5);
    const auto events = watch.picture({luma.data(), kStride, kWidth, kHeight}, t);
    if (!events.empty()) all += (all.empty() ? "" : " ") + told(events, t - 100);
  }
  return all;
}

TEST(SignalWatch, Pictures) {
  EXPECT_EQ(watchPictures(noisy(90, 3)), "");
  EXPECT_EQ(watchPictures(noisy(16, 6)), "black+10");
  EXPECT_EQ(watchPictures(noisy(24, 2)), "") << "dark, but not black";
  EXPECT_EQ(watchPictures(then(noisy(16, 4), 30, noisy(90, 3))), "black+10 black-29");
  EXPECT_EQ(watchPictures(then(noisy(90, 3), 20, noisy(16, 4))), "black+30");
  EXPECT_EQ(watchPictures(then(noisy(16, 4), 9, noisy(90, 3))), "") << "not long enough";
  EXPECT_EQ(watchPictures(even(120)), "frozen+10");
  EXPECT_EQ(watchPictures(then(even(120), 40, noisy(120, 1))), "frozen+10 frozen-39");
  EXPECT_EQ(watchPictures(even(16)), "black+10") << "not frozen, too";
  EXPECT_EQ(watchPictures([](auto& luma, int n) { std::fill(luma.begin(), luma.end(), 60 + n / 9); }), "")
      << "slides of nine seconds";
}

TEST(SignalWatch, ThresholdsOfPictures) {
  EXPECT_EQ(watchPictures(even(120), {.seconds = 0}), "");
  EXPECT_EQ(watchPictures(even(120), {.seconds = 30}), "frozen+30");
  EXPECT_EQ(watchPictures(even(120), {.frozenDifference = std::nullopt}), "");
  EXPECT_EQ(watchPictures(noisy(120, 3), {.frozenDifference = 3}), "frozen+10");
  EXPECT_EQ(watchPictures(noisy(16, 4), {.blackLevel = std::nullopt}), "");
  EXPECT_EQ(watchPictures(noisy(30, 4), {.blackLevel = 40}), "black+10");
}

TEST(SignalWatch, AFewBrightPointsAreNoPicture) {
  const auto withLight = [](std::size_t points) {
    return [points](std::vector<std::uint8_t>& luma, int n) {
      noisy(16, 4)(luma, n);
      for (std::size_t row = 0; row < points; ++row) {
        std::fill_n(luma.begin() + static_cast<std::ptrdiff_t>(row * kStride), points, 200);
      }
    };
  };
  EXPECT_EQ(watchPictures(withLight(12)), "black+10");
  EXPECT_EQ(watchPictures(withLight(40)), "") << "a projector";
}

TEST(SignalWatch, PicturesOfAnySizeAreLookedAtOnceASecond) {
  SignalWatch watch({});
  const std::vector<std::uint8_t> luma(64, 16);
  for (int i = 0; i < 20; ++i) {
    EXPECT_TRUE(watch.wantsPicture(i));
    (void)watch.picture({luma.data(), 8, 8, 8}, i);
    EXPECT_FALSE(watch.wantsPicture(i + 0.9));
  }
  EXPECT_TRUE(watch.picture({}, 30).empty());
}

// ---- sound

/// The sample at second `t`.
using Signal = std::function<float(double t)>;

Signal tone(double amplitude) {
  return [amplitude](double t) {
    return static_cast<float>(std::clamp(amplitude * std::sin(2 * std::numbers::pi * 440 * t), -1.0, 1.0));
  };
}

std::string watchSound(const Signal& signal, const SignalThresholds& thresholds = {}, int seconds = 40) {
  SignalWatch watch(thresholds);
  std::string all;
  constexpr int kChunk = 1024;
  std::vector<float> samples(kChunk * 2);
  for (int chunk = 0; chunk * kChunk < seconds * kRate; ++chunk) {
    const double t = static_cast<double>(chunk) * kChunk / kRate;
    for (std::size_t i = 0; i < kChunk; ++i) {
      samples[2 * i] = signal(t + static_cast<double>(i) / kRate);
      samples[2 * i + 1] = 0;  // nobody has connected the right channel
    }
    const auto events = watch.sound(samples, 2, kRate, t);
    if (!events.empty()) all += (all.empty() ? "" : " ") + told(events, t);
  }
  return all;
}

TEST(SignalWatch, Sound) {
  EXPECT_EQ(watchSound(tone(0.1)), "");
  EXPECT_EQ(watchSound(tone(0)), "silence+10");
  EXPECT_EQ(watchSound(tone(0.00003)), "silence+10") << "the last bit of 16";
  EXPECT_EQ(watchSound(tone(0.0003)), "") << "a quiet room";
  EXPECT_EQ(watchSound([](double t) { return tone(t < 20 ? 0 : 0.1)(t); }), "silence+10 silence-19");
  EXPECT_EQ(watchSound([](double t) { return tone(std::fmod(t, 9) < 0.1 ? 0.01 : 0)(t); }), "") << "a clock";
  EXPECT_EQ(watchSound(tone(1.3)), "clipping+10");
  EXPECT_EQ(watchSound(tone(0.98)), "") << "loud";
  EXPECT_EQ(watchSound([](double t) { return std::fmod(t, 0.5) < 1e-5 ? 1.0F : 0.1F; }), "")
      << "single peaks are no clipping";
  EXPECT_EQ(watchSound([](double t) { return tone(std::fmod(t, 4) < 2 ? 1.5 : 0.01)(t); }), "clipping+10")
      << "a speaker who breathes";
  EXPECT_EQ(watchSound([](double t) { return tone(t < 20 ? 1.5 : 0.1)(t); }), "clipping+10 clipping-20");
}

TEST(SignalWatch, ThresholdsOfSound) {
  EXPECT_EQ(watchSound(tone(0), {.seconds = 0}), "");
  EXPECT_EQ(watchSound(tone(0), {.silenceDecibels = std::nullopt}), "");
  EXPECT_EQ(watchSound(tone(0.009), {.silenceDecibels = -40}), "silence+10");
  EXPECT_EQ(watchSound(tone(1.3), {.clippingDecibels = std::nullopt}), "");
  EXPECT_EQ(watchSound(tone(0.8), {.clippingDecibels = -6}), "clipping+10");
}

TEST(SignalWatch, NonsenseDoesNoHarm) {
  EXPECT_EQ(watchSound([](double) { return std::nanf(""); }), "silence+10") << "nothing can be heard";
  SignalWatch watch({});
  EXPECT_TRUE(watch.sound({}, 0, 0, 0).empty());
  EXPECT_TRUE(watch.sound({}, 2, kRate, 0).empty());
}

TEST(SignalWatch, TellsInWords) {
  using enum SignalTrouble;
  EXPECT_EQ(signalText({silence, true, 10.2}), "The microphone has been silent for 10 seconds; is it muted?");
  EXPECT_EQ(signalText({clipping, true, 11}),
            "The sound has been too loud and cut off for 11 seconds; turn the microphone down");
  EXPECT_EQ(signalText({black, false, 75}), "The picture was black for 75 seconds, and is all right again");
  EXPECT_EQ(signalText({frozen, true, 10}),
            "The picture has not changed for 10 seconds; is the camera frozen?");
}

}  // namespace
}  // namespace lmx
