// Decibels to the levels of a status reply.
#include "control/protocol/audio_levels.h"

#include <gtest/gtest.h>

#include <limits>

namespace lmx {
namespace {

TEST(AudioLevels, NoChannelsReadZero) {
  EXPECT_EQ(audioLevels({}).left, 0.0F);
  EXPECT_EQ(audioLevels({}).right, 0.0F);
}

TEST(AudioLevels, OneChannelAtMinusSixDecibelsReadsOnBothSides) {
  const AudioLevels levels = audioLevels({-6.0});
  EXPECT_NEAR(levels.left, 10.02, 0.005);
  EXPECT_EQ(levels.right, levels.left);
}

TEST(AudioLevels, FirstTwoChannelsAreLeftAndRight) {
  const AudioLevels levels = audioLevels({0.0, -20.0, -40.0});
  EXPECT_FLOAT_EQ(levels.left, 20.0F);
  EXPECT_FLOAT_EQ(levels.right, 2.0F);
}

TEST(AudioLevels, SilenceReadsZero) {
  EXPECT_EQ(audioLevels({-std::numeric_limits<double>::infinity()}).left, 0.0F);
}

}  // namespace
}  // namespace lmx
