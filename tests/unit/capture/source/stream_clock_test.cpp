// Where a network camera's pictures and sound are placed in time.
#include "capture/source/stream_clock.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <vector>

namespace lmx {
namespace {

using Stream = StreamClock::Stream;
using Function = std::function<double(double taken)>;

constexpr double kChunk = 0.02;

/// A camera with both streams. What is taken at a time arrives in order, so much later at least.
struct Camera {
  Function stamp = [](double taken) { return taken; };
  Function delay = [](double) { return 0.01; };
  double soundFirst = 0;  ///< seconds by which the sound's stamps precede the picture's arrival

  struct Placed {
    double taken = 0;
    double picture = 0;
    double sound = 0;
  };
  /// @return where what is taken each 0.2 s is placed
  [[nodiscard]] std::vector<Placed> run(double seconds) const {
    StreamClock clock;
    std::vector<Placed> result;
    double arrival = 0;
    for (int i = 0; i * kChunk < seconds; ++i) {
      const double taken = i * kChunk;
      arrival = std::max(arrival, taken + delay(taken));
      const double sound = clock.place(Stream::sound, stamp(taken) + soundFirst, arrival);
      if (i % 2 != 0) continue;
      const double picture = clock.place(Stream::picture, stamp(taken), arrival);
      if (i % 10 == 0) result.push_back({taken, picture, sound});
    }
    return result;
  }
};

bool between(double taken, double from, double to) { return taken >= from && taken < to; }

TEST(StreamClock, StampsThatAreRightStay) {
  for (const auto& one : Camera{}.run(60)) {
    EXPECT_DOUBLE_EQ(one.picture, one.taken);
    EXPECT_DOUBLE_EQ(one.sound, one.taken);
  }
}

TEST(StreamClock, WhatIsLateForAWhileKeepsItsPlace) {
  const struct {
    const char* what;
    Function delay;
  } cases[] = {
      {"a stall", [](double t) { return between(t, 20, 22) ? 22 - t : 0.01; }},
      {"a stall just after the start", [](double t) { return between(t, 1, 3) ? 3 - t : 0.01; }},
      {"half the rate", [](double t) { return between(t, 20, 25) ? (t - 20) / 2 : 0.01; }},
      {"a slow start", [](double t) { return std::max(0.01, 1.5 - t * 3); }},
      {"jitter", [](double t) { return 0.3 * (1 - std::fmod(t, 1.0)); }},
  };
  for (const auto& one : cases) {
    Camera camera;
    camera.delay = one.delay;
    for (const auto& placed : camera.run(60)) {
      ASSERT_NEAR(placed.picture, placed.taken, 0.02) << one.what << " at " << placed.taken;
      ASSERT_NEAR(placed.sound, placed.picture, 0.001) << one.what;
    }
  }
}

TEST(StreamClock, AClockThatIsOffIsFollowed) {
  for (const double ppm : {-500.0, 500.0, 5000.0}) {
    Camera camera;
    camera.stamp = [=](double taken) { return taken * (1 + ppm * 1e-6); };
    double before = -1;
    for (const auto& placed : camera.run(4 * 3600)) {
      ASSERT_NEAR(placed.picture, placed.taken, std::abs(ppm) * 1e-6 * 65 + 0.001) << ppm;
      ASSERT_NEAR(placed.sound, placed.picture, 0.001);
      ASSERT_GT(placed.picture, before);
      before = placed.picture;
    }
  }
}

TEST(StreamClock, StampsThatJumpGoOnWhereTheyWere) {
  for (const double jump : {-3600.0, -10.0, 1.5, 10.0, 1e6}) {
    Camera camera;
    camera.stamp = [=](double taken) { return taken + (taken < 20 ? 0 : jump); };
    camera.delay = [](double t) { return 0.02 + 0.02 * std::sin(1000 * t); };
    for (const auto& placed : camera.run(60)) {
      ASSERT_NEAR(placed.picture, placed.taken, 0.05) << jump << " at " << placed.taken;
      ASSERT_NEAR(placed.sound, placed.picture, 0.001) << jump;
    }
  }
}

TEST(StreamClock, ALateFirstPacketIsMadeUpForGently) {
  Camera camera;
  camera.stamp = [](double taken) { return taken + 0.2; };
  double before = -1;
  for (const auto& placed : camera.run(200)) {
    if (placed.taken > 150) {
      ASSERT_NEAR(placed.picture, placed.taken, 0.06);
    }
    if (before >= 0) {
      ASSERT_NEAR(placed.picture - before, 0.2, 0.2 * 0.005);
    }
    before = placed.picture;
  }
}

TEST(StreamClock, TheSoundKeepsItsDistanceFromThePicture) {
  Camera camera;
  camera.soundFirst = 0.15;
  for (const auto& placed : camera.run(60)) ASSERT_NEAR(placed.sound - placed.picture, 0.15, 1e-9);
}

TEST(StreamClock, ThePictureLeads) {
  StreamClock clock;
  for (int i = 0; i < 50 * 120; ++i) {
    const double taken = i * kChunk;
    const double late = taken > 20 ? 0.5 : 0.01;  // of the sound alone
    ASSERT_NEAR(clock.place(Stream::picture, taken, taken + 0.01), taken, 1e-6);
    ASSERT_NEAR(clock.place(Stream::sound, taken, taken + late), taken, 1e-6);
  }
}

TEST(StreamClock, SoundAloneIsBroughtInLineToo) {
  StreamClock clock;
  for (int i = 0; i < 50 * 600; ++i) {
    const double taken = i * kChunk;
    const double placed = clock.place(Stream::sound, taken * 1.0005, taken + 0.01);
    ASSERT_NEAR(placed, taken, 0.04);
  }
}

}  // namespace
}  // namespace lmx
