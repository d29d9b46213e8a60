// The limits of a recording, from the parameters of its START.
#include "record/recording_limits.h"

#include <gtest/gtest.h>

#include <limits>
#include <utility>
#include <vector>

namespace lmx {
namespace {

struct MinutesCase {
  const char* minutes;
  std::int32_t seconds;
};

TEST(HardStop, MinutesBecomeSeconds) {
  constexpr auto kMost = std::numeric_limits<std::int32_t>::max();
  for (const MinutesCase& c : {MinutesCase{"1.5", 90},
                               {"0.01", 1},
                               {"90.5", 5430},
                               {"0", 0},
                               {"-1", 0},
                               {"0.008", 0},
                               {"0.0084", 1},
                               {"", 0},
                               {"soon", 0},
                               {"nan", 0},
                               {"inf", 0},
                               {"-inf", 0},
                               {"1e400", 0},
                               {"1e300", kMost},
                               {"35791394.1", 2147483646},
                               {"35791394.2", kMost},
                               {"50 minutes", 3000}}) {
    EXPECT_EQ(hardStopSeconds(c.minutes), c.seconds) << c.minutes;
  }
}

struct LengthCase {
  std::int32_t usual;
  const char* asked;
  std::uint32_t minutes;
};

TEST(GreatestLength, IsTheLongerOfTheUsualAndTheAsked) {
  for (const LengthCase& c : {LengthCase{240, "", 240},
                              {240, "50", 240},
                              {240, "240", 240},
                              {240, "240.01", 241},
                              {240, "600", 600},
                              {240, "600.5", 601},
                              {240, "0", 240},
                              {240, "-600", 240},
                              {240, "all day", 240},
                              {240, "1e300", 35791395},
                              {1, "0.5", 1},
                              {0, "600", 0},
                              {-5, "600", 0}}) {
    EXPECT_EQ(greatestLengthInMinutes(c.usual, c.asked), c.minutes) << c.usual << " " << c.asked;
  }
}

class StopTimesOfStart : public ::testing::Test {
 protected:
  void configure(const char* key, const char* value) { configureStopTimes({{key, value}}, stop_times_); }
  /// Seconds from now to the hard stop; -1 when there is none.
  std::int64_t hardStopIn() {
    const auto stop = stop_times_.hardStopTime.get();
    return stop ? std::int64_t{stop->tv_sec} - std::int64_t{lmp_gettimeofday()->tv_sec} : -1;
  }
  StopTimes stop_times_;
};

TEST_F(StopTimesOfStart, MaximumMinutesSetTheHardStop) {
  configure("RecordingMetadata_MAX_RECORDING_MINUTES", "1.5");
  EXPECT_GE(hardStopIn(), 89);
  EXPECT_LE(hardStopIn(), 90);
}

TEST_F(StopTimesOfStart, AHundredthOfAMinuteIsOneSecond) {
  configure("RecordingMetadata_MAX_RECORDING_MINUTES", "0.01");
  EXPECT_GE(hardStopIn(), 0);
  EXPECT_LE(hardStopIn(), 1);
}

TEST_F(StopTimesOfStart, EmptyValuesLeaveThemAsTheyWere) {
  configure("RecordingMetadata_MAX_RECORDING_MINUTES", "5");
  configure("RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "7");
  configure("RecordingMetadata_MAX_RECORDING_MINUTES", "");
  configure("RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "");
  EXPECT_GE(hardStopIn(), 0);
  EXPECT_EQ(stop_times_.maxUnattendedRecordingMinutes.get(), 7);
}

/// Minutes that do not fit, or whose seconds do not fit, into 32 bits; 35791394 is the greatest that does.
TEST_F(StopTimesOfStart, AnEndlessUnattendedLimitDoesNotEndTheRecording) {
  constexpr std::int64_t kMost = std::numeric_limits<std::int32_t>::max();
  for (const auto& [minutes, seconds] :
       std::vector<std::pair<const char*, std::int64_t>>{{"2147483647", kMost},
                                                         {"4294967297", kMost},
                                                         {"99999999999999999999", kMost},
                                                         {"35791395", kMost},
                                                         {"35791394", 35791394LL * 60}}) {
    configure("RecordingMetadata_UNATTENDED_RECORDING_MINUTES", minutes);
    stop_times_.updateSoftStopTime();
    const auto stop = stop_times_.softStopTime.get();
    ASSERT_TRUE(stop) << minutes;
    EXPECT_NEAR(static_cast<double>(stop->tv_sec - lmp_gettimeofday()->tv_sec), static_cast<double>(seconds),
                1.0)
        << minutes;
    EXPECT_FALSE(stop_times_.shouldStopRecording()) << minutes;
  }
}

TEST_F(StopTimesOfStart, ANegativeLimitIsNone) {
  configure("RecordingMetadata_UNATTENDED_RECORDING_MINUTES", "-99999999999");
  stop_times_.updateSoftStopTime();
  EXPECT_FALSE(stop_times_.softStopTime.get());
}

}  // namespace
}  // namespace lmx
