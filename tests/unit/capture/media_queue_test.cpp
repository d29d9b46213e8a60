// Who waits, who is dropped, and what wakes the recorder.
#include "capture/media_queue.h"

#include <gtest/gtest.h>

#include <future>

#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using Clock = MediaQueue::Clock;

TEST(MediaQueue, SoundWaitsForThePicture) {
  MediaQueue queue(true, true);
  queue.pushAudio({nullptr, 1});
  queue.pushVideo({nullptr, 2});
  const auto batch = queue.take();
  EXPECT_EQ(batch.video.size(), 1U);
  EXPECT_EQ(batch.audio.size(), 1U);
  EXPECT_TRUE(batch.inTime);
}

TEST(MediaQueue, SoundAloneIsEnoughWhereThereIsNoPictureAndAtTheEnd) {
  MediaQueue soundOnly(false, true);
  soundOnly.pushAudio({nullptr, 1});
  EXPECT_EQ(soundOnly.take().audio.size(), 1U);
  MediaQueue ending(true, true);
  ending.pushAudio({nullptr, 1});
  ending.hurry(Clock::time_point::max());
  EXPECT_EQ(ending.take().audio.size(), 1U);
}

/// A network camera may be away for ten seconds, and chunks may be short.
TEST(MediaQueue, SoundWaitsForALongTime) {
  MediaQueue queue(true, true);
  constexpr double kChunk = 256.0 / 48000;
  for (int i = 0; i * kChunk < 15; ++i) queue.pushAudio({nullptr, i * kChunk});
  queue.pushVideo({nullptr, 15});
  const auto batch = queue.take();
  EXPECT_NEAR(batch.audio.back().time, 15, 0.01);
  EXPECT_EQ(batch.audio.front().time, 0);
}

TEST(MediaQueue, GivesUpAtTheEarliestDeadline) {
  MediaQueue queue(true, true);
  queue.hurry(Clock::now());
  queue.hurry(Clock::now() + 1h);
  EXPECT_FALSE(queue.take().inTime);
  EXPECT_TRUE(queue.expired());
}

TEST(MediaQueue, LiveFramesThatFindItFullAreDroppedAndLogged) {
  testing::LogCapture log;
  MediaQueue queue(true, true);
  for (int i = 0; i < 100; ++i) queue.pushVideo({nullptr, i / 30.0});
  const auto batch = queue.take();
  EXPECT_EQ(batch.video.size(), 90U);
  EXPECT_EQ(batch.lost, 10U);
  EXPECT_EQ(batch.lostFrom, 90 / 30.0);
  EXPECT_TRUE(log.waitForPart("The encoder can't keep up: 1 frames dropped so far"));
  queue.pushVideo({nullptr, 4});
  EXPECT_EQ(queue.take().lost, 0U);
}

TEST(MediaQueue, FramesThatAreNotLiveWaitForRoom) {
  MediaQueue queue(true, false);
  auto pushing = std::async(std::launch::async, [&] {
    for (int i = 0; i < 100; ++i) queue.pushVideo({nullptr, i / 30.0});
  });
  std::size_t taken = 0;
  while (taken < 100) taken += queue.take().video.size();
  pushing.get();
  EXPECT_EQ(taken, 100U);
}

TEST(MediaQueue, ClosingReleasesWhoWaitsAndDropsTheRest) {
  MediaQueue queue(true, false);
  auto pushing = std::async(std::launch::async, [&] {
    for (int i = 0; i < 100; ++i) queue.pushVideo({nullptr, i / 30.0});
  });
  queue.close();
  pushing.get();
  queue.hurry(Clock::now());
  EXPECT_TRUE(queue.take().video.empty());
}

}  // namespace
}  // namespace lmx
