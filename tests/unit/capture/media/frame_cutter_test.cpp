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

TEST(FrameCutter, TheFrameBeforeAMarkLastsUntilIt) {
  struct Row {
    double newest;  // frames since the run began
    double until;
    std::uint32_t frames;
  };
  for (const Row& row : {Row{12, 30, 30}, Row{12, 30.4, 30}, Row{29, 29.1, 30}, Row{29, 30.4, 30},
                         Row{28.6, 30, 30}, Row{29, 3, 30}, Row{29, -100, 30}}) {
    FrameCutter cutter(kFrame);
    cutter.prolong(7);
    EXPECT_EQ(cutter.frames(), 0U) << "there is no frame";
    cutter.decide(5, true, false);
    cutter.decide(5 + row.newest * kFrame, true, false);
    cutter.prolong(5 + row.until * kFrame);
    EXPECT_EQ(cutter.frames(), row.frames) << row.newest << ' ' << row.until;
    EXPECT_EQ(cutter.runs().back().frames, row.frames);
    cutter.close();
    cutter.prolong(50);
    EXPECT_EQ(cutter.frames(), row.frames) << "behind the cut";
    EXPECT_EQ(cutter.decide(60, true, false).place, row.frames);
  }
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
