// Microphones that make no sense.
#include <gtest/gtest.h>

#include <limits>
#include <vector>

#include "capture/source/steady_sound.h"
#include "tests/unit/capture/source/microphone.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using testing::bufferOf;
using testing::Listener;
using testing::Microphone;

constexpr int kRate = 8000;

/// A microphone and all that listens to it.
struct Room {
  SteadySound sound{kRate, 2};
  Microphone microphone{kRate, 0, 25};
  Listener listener{kRate, 25};
  /// Feeds ten milliseconds that arrive then.
  void feed(double arrival) { listener.listen(sound.feed(bufferOf(microphone.hear(kRate / 100)), arrival)); }
  void feedPunctually(double seconds) {
    for (int i = 0; i < seconds * 100; ++i) {
      auto buffer = bufferOf(microphone.hear(kRate / 100));
      listener.listen(sound.feed(std::move(buffer), microphone.now()));
    }
  }
  [[nodiscard]] double given() const { return static_cast<double>(listener.frames()) / kRate; }
};

/// @param pace  seconds of sound in a second of time
void recordAtPace(double pace) {
  testing::LogCapture log;
  Room room;
  const double begin = room.microphone.now();
  for (int i = 0; i < 6000 * pace; ++i) room.feed(begin + i * 0.01 / pace);
  EXPECT_LT(room.given(), 63) << pace;  // the first quarter of a second may hold more than it should
  EXPECT_GT(room.given(), std::min(pace, 1.0) * 60 * 0.8) << pace;
  EXPECT_LT(room.listener.overlap(), 1e-6);
  EXPECT_NEAR(room.listener.end(), begin + 60, 1) << pace;
  EXPECT_EQ(log.entries().size(), 1U) << pace;
  EXPECT_TRUE(log.mentions("does not keep time"));
}

TEST(SteadySoundNonsense, SoundThatComesTooFastIsLeftOut) { recordAtPace(10); }
TEST(SteadySoundNonsense, SoundThatComesTooSlowlyIsInParts) { recordAtPace(0.5); }

TEST(SteadySoundNonsense, AllAtOnceIsHeldForSomeSecondsOnly) {
  Room room;
  for (int i = 0; i < 20000; ++i) room.feed(5);
  EXPECT_EQ(room.given(), 0);
  room.feed(6);
  EXPECT_LE(room.given(), 4.1);
  room.listener.listen(room.sound.feed(bufferOf(room.microphone.hear(kRate * 600)), 606));
  EXPECT_LE(room.given(), 8.2);
  EXPECT_LT(room.listener.overlap(), 1e-6);
}

TEST(SteadySoundNonsense, OneBadStampChangesNothing) {
  const double inf = std::numeric_limits<double>::infinity();
  for (const double arrival : {-1e9, 0.0, 1e9, inf, -inf, std::nan("")}) {
    Room room;
    room.feedPunctually(10);
    room.feed(arrival);
    room.feedPunctually(10);
    EXPECT_LT(room.listener.worst(), 0.005) << arrival;
    EXPECT_NEAR(room.given(), 20, 0.05) << arrival;
    EXPECT_EQ(room.sound.jumps(), 0U) << arrival;
  }
}

TEST(SteadySoundNonsense, AClockThatIsSetBackNeverGivesTimesTwice) {
  Room room;
  room.feedPunctually(10);
  const double now = room.microphone.now();
  for (int i = 0; i < 1000; ++i) room.feed(now - 5 + i * 0.01);
  EXPECT_LT(room.listener.overlap(), 1e-6);
  EXPECT_NEAR(room.given(), 15, 0.1);
}

TEST(SteadySoundNonsense, NothingAndHalvesAreLeftOut) {
  Room room;
  room.listener.listen(room.sound.feed(nullptr, 1));
  room.listener.listen(room.sound.feed(bufferOf({}), 2));
  room.listener.listen(room.sound.feed(bufferOf({0.5F}), 3));
  EXPECT_EQ(room.given(), 0);
  room.feedPunctually(5);
  EXPECT_NEAR(room.given(), 5, 0.05);
  EXPECT_LT(room.listener.worst(), 0.005);
}

}  // namespace
}  // namespace lmx
