// Bit rates and the movie's clock.
#include "capture/gst/encoding.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

TEST(Encoding, AFrameLastsWholeTimescaleUnits) {
  struct Case {
    double rate;
    std::uint32_t timescale;
    std::uint32_t duration;
  };
  for (const Case& c : {Case{30, 30000, 1000}, Case{25, 25000, 1000}, Case{29.97, 30000, 1001},
                        Case{12.5, 12500, 1000}, Case{1, 10000, 10000}}) {
    const FrameRate rate = frameRateFrom(c.rate);
    EXPECT_EQ(videoTimescale(rate), c.timescale) << c.rate;
    EXPECT_EQ(frameDuration(rate), c.duration) << c.rate;
    EXPECT_DOUBLE_EQ(static_cast<double>(c.duration) / c.timescale, rate.frameSeconds()) << c.rate;
  }
}

TEST(Encoding, BitRateGrowsLessThanThePicture) {
  const auto bitRate = [](int width, int height, RecordingQuality quality = RecordingQuality::better) {
    return videoBitRate({.size = {width, height}, .frameRate = {30, 1}, .quality = quality});
  };
  EXPECT_NEAR(bitRate(1280, 720), 2500, 100);
  EXPECT_NEAR(bitRate(1920, 1080), 4500, 200);
  EXPECT_EQ(bitRate(64, 64), 150);
  EXPECT_LT(bitRate(1280, 720, RecordingQuality::good), bitRate(1280, 720));
  EXPECT_GT(bitRate(1280, 720, RecordingQuality::best), bitRate(1280, 720));
}

TEST(Encoding, EffortFollowsQualitySizeAndMachine) {
  const auto effort = [](int width, int height, RecordingQuality quality, unsigned cores) {
    return std::string(speedPreset({{width, height}, {30, 1}, quality}, cores));
  };
  using Q = RecordingQuality;
  EXPECT_EQ(effort(1280, 720, Q::good, 8), "superfast");
  EXPECT_EQ(effort(1280, 720, Q::better, 2), "veryfast");
  EXPECT_EQ(effort(1920, 1080, Q::better, 8), "superfast");
  EXPECT_EQ(effort(1920, 1080, Q::best, 2), "superfast");
  EXPECT_EQ(effort(1920, 1080, Q::best, 4), "veryfast");
}

TEST(Encoding, SoundAloneIsCutInHundredthsOfASecond) {
  EXPECT_DOUBLE_EQ((MovieEncoding{.video = {}, .audio = AudioEncoding{}}.frameSeconds()), 0.01);
}

}  // namespace
}  // namespace lmx
