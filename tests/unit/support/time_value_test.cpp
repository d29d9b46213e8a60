// Time values.
#include "support/time_value.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <time.h>

#include <cstring>
#include <limits>
#include <string>

namespace lmx {
namespace {

constexpr std::int64_t kMaximum = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kMinimum = std::numeric_limits<std::int64_t>::min();

TimeValue at(std::int64_t seconds, std::int64_t micros) {
  TimeValue value{};
  value.tv_sec = seconds;
  value.tv_usec = micros;
  return value;
}

TEST(DiffTimeval, OfATimeWithItselfIsZero) {
  const TimeValue time = at(1700000000, 123456);
  EXPECT_EQ(lmp_diff_timeval(time, time), 0);
}

TEST(DiffTimeval, OneAndAHalfSecondsLaterIs1500) {
  const TimeValue earlier = at(1700000000, 600000);
  const TimeValue later = at(1700000002, 100000);
  EXPECT_EQ(lmp_diff_timeval(later, earlier), 1500);
  EXPECT_EQ(lmp_diff_timeval(earlier, later), -1500);
}

TEST(DiffTimeval, TruncatesTowardZero) {
  const TimeValue zero = at(0, 0);
  const TimeValue almost = at(0, 1999);
  EXPECT_EQ(lmp_diff_timeval(almost, zero), 1);
  EXPECT_EQ(lmp_diff_timeval(zero, almost), -1);
}

TEST(DiffTimeval, SaturatesForDistantTimes) {
  const TimeValue end = at(kMaximum, 999999);
  const TimeValue begin = at(kMinimum, 0);
  const TimeValue zero = at(0, 0);
  const TimeValue ages = at(kMaximum / 2000, 0);
  EXPECT_EQ(lmp_diff_timeval(end, begin), kMaximum);
  EXPECT_EQ(lmp_diff_timeval(begin, end), kMinimum);
  EXPECT_EQ(lmp_diff_timeval(ages, zero), kMaximum / 2000 * 1000);
}

TEST(GetTimeOfDay, LiesBetweenTwoClockReadings) {
  const time_t before = time(nullptr);
  const auto now = lmp_gettimeofday();
  ASSERT_TRUE(now);
  // time() may lag behind the precise clock by one tick.
  EXPECT_GE(now->tv_sec, before);
  EXPECT_LE(now->tv_sec, time(nullptr) + 1);
  EXPECT_GE(now->tv_usec, 0);
  EXPECT_LT(now->tv_usec, 1000000);
}

TEST(TimevalToCtime, MatchesCtimeWithoutTheLineFeed) {
  for (const std::int64_t seconds : {0LL, 951782400LL, 1700000000LL}) {
    const TimeValue time = at(seconds, 999999);
    std::string expected = ctime(&time.tv_sec);
    expected.pop_back();
    EXPECT_EQ(lmp_timeval_to_ctime(time), expected);
  }
}

TEST(TimevalToCtime, IsAQuestionMarkForATimeOutOfRange) {
  EXPECT_EQ(lmp_timeval_to_ctime(at(kMaximum, 0)), "?");
}

TEST(TimevalArithmetic, CarriesAndBorrowsMicroseconds) {
  struct Case {
    TimeValue a, b, sum, difference;
  };
  const Case cases[] = {
      {at(1, 700000), at(2, 600000), at(4, 300000), at(-1, 100000)},
      {at(10, 0), at(0, 1), at(10, 1), at(9, 999999)},
      {at(3, 500000), at(1, 500000), at(5, 0), at(2, 0)},
      {at(7, 999999), at(0, 0), at(7, 999999), at(7, 999999)},
  };
  for (const Case& c : cases) {
    const TimeValue sum = LXAgentTimevalAdd(c.a, c.b);
    const TimeValue difference = LXAgentTimevalSubtract(c.a, c.b);
    EXPECT_EQ(sum.tv_sec, c.sum.tv_sec);
    EXPECT_EQ(sum.tv_usec, c.sum.tv_usec);
    EXPECT_EQ(difference.tv_sec, c.difference.tv_sec);
    EXPECT_EQ(difference.tv_usec, c.difference.tv_usec);
  }
}

TEST(ReferenceDate, IsTheWallClockSince2001) {
  const double now = secondsSinceReferenceDate();
  const auto wall = lmp_gettimeofday();
  ASSERT_TRUE(wall);
  EXPECT_NEAR(now + kReferenceDateOffset, static_cast<double>(wall->tv_sec), 5);
}

}  // namespace
}  // namespace lmx
