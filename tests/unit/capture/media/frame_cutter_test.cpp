// Live frames to their places.
#include "capture/media/frame_cutter.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

constexpr double kFrame = 1.0 / 30.0;

TEST(FrameCutter, CutsWithoutAGap) {
  FrameCutter cutter(kFrame);
  std::vector<std::uint32_t> places;
  for (int n = 0; n < 40; ++n) {
    const bool wanted = (n >= 5 && n < 10) || n >= 20;
    const FrameDecision decision = cutter.decide(n * kFrame, wanted, false);
    EXPECT_EQ(decision.take, wanted);
    EXPECT_EQ(decision.forceKey, n == 5 || n == 20);
    if (decision.take) places.push_back(decision.place);
  }
  for (std::size_t i = 0; i < places.size(); ++i) EXPECT_EQ(places[i], i);
  ASSERT_EQ(cutter.runs().size(), 2U);
  EXPECT_EQ(cutter.runs()[1].firstFrame, 5U);
}

TEST(FrameCutter, MissingFrameKeepsItsPlace) {
  FrameCutter cutter(kFrame);
  cutter.decide(0, true, false);
  EXPECT_EQ(cutter.decide(3 * kFrame, true, false).place, 3U);
  EXPECT_FALSE(cutter.decide(3.2 * kFrame, true, false).take);
}

TEST(FrameCutter, SpanThatBeginsInsideARunGetsAKeyFrame) {
  FrameCutter cutter(kFrame);
  cutter.decide(0, true, false);
  EXPECT_TRUE(cutter.decide(kFrame, true, true).forceKey);
}

TEST(FrameCutter, APlaceInTheMovieHasATime) {
  FrameCutter cutter(kFrame);
  EXPECT_EQ(cutter.timeAt(3), 3) << "nothing has been recorded";
  for (int n = 0; n < 120; ++n) cutter.decide(5 + n * kFrame, n < 30 || n >= 90, false);
  EXPECT_NEAR(cutter.timeAt(0), 5, 1e-6);
  EXPECT_NEAR(cutter.timeAt(0.99), 5.99, 1e-6);
  EXPECT_NEAR(cutter.timeAt(1.0 - 1e-5), 8, 1e-4) << "the run behind the cut";
  EXPECT_NEAR(cutter.timeAt(1.5), 8.5, 1e-6);
}

}  // namespace
}  // namespace lmx
