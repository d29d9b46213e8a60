// How tracks describe themselves.
#include "capture/movie/sample_description.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(AudioSpecificConfig, SaysLowComplexityRateAndChannels) {
  EXPECT_EQ(audioSpecificConfig(48000, 2), (Bytes{0x11, 0x90, 0x56, 0xE5, 0x00}));
  EXPECT_EQ(audioSpecificConfig(44100, 1), (Bytes{0x12, 0x08, 0x56, 0xE5, 0x00}));
  EXPECT_EQ(audioSpecificConfig(16000, 2), (Bytes{0x14, 0x10, 0x56, 0xE5, 0x00}));
  // A rate that has no number is written out, in 24 bits.
  EXPECT_EQ(audioSpecificConfig(50000, 2), (Bytes{0x17, 0x80, 0x61, 0xA8, 0x10, 0x56, 0xE5, 0x00}));
}

}  // namespace
}  // namespace lmx
