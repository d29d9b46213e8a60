// Frame rates as fractions.
#include "capture/api/picture.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(FrameRate, TelevisionRatesAreExact) {
  EXPECT_EQ(frameRateFrom(30), (FrameRate{30, 1}));
  EXPECT_EQ(frameRateFrom(29.97), (FrameRate{30000, 1001}));
  EXPECT_EQ(frameRateFrom(23.976), (FrameRate{24000, 1001}));
  EXPECT_EQ(frameRateFrom(12.5), (FrameRate{12500, 1000}));
}

}  // namespace
}  // namespace lmx
