// Late sound, and missing sound.
#include "capture/source/arrival_judge.h"

#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

namespace lmx {
namespace {

using Finding = ArrivalJudge::Finding;

/// A judge that has heard ten punctual seconds in chunks of 20 ms.
ArrivalJudge settled() {
  ArrivalJudge judge;
  for (int i = 1; i <= 500; ++i) judge.judge({.heard = i * 0.02, .arrival = i * 0.02});
  return judge;
}

/// What it finds about further chunks that are so late: "." in time, "?" undecided, "J" jump.
std::string findings(const std::vector<double>& lateness) {
  ArrivalJudge judge = settled();
  std::string found;
  double heard = 10;
  for (const double late : lateness) {
    heard += 0.02;
    const Finding finding = judge.judge({.heard = heard, .arrival = heard + late});
    found += finding == Finding::inTime ? '.' : finding == Finding::jump ? 'J' : '?';
  }
  return found;
}

TEST(ArrivalJudge, TheStartWaitsForTheEarliestOfAQuarterSecond) {
  ArrivalJudge judge;
  const std::vector<double> late{0.03, 0.2, 0.03, 0.001, 0.03};
  std::string found;
  for (int i = 1; i <= 16; ++i) {
    const double heard = i * 0.02;
    const double jitter = late[static_cast<std::size_t>(i) % late.size()];
    const Finding finding = judge.judge({.heard = heard, .arrival = heard + jitter});
    if (finding == Finding::jump) break;
    found += '?';
  }
  EXPECT_GE(found.size(), 9U);
  EXPECT_LE(found.size(), 15U);
  EXPECT_NEAR(judge.clock().timeAt(1), 1.001, 1e-9);
}

TEST(ArrivalJudge, TellsLateFromMissing) {
  EXPECT_EQ(findings({0, 0.017, 0, 0.017}), "....");
  EXPECT_EQ(findings({0.019, 0.03, 0.01, 0}), "??..");
  EXPECT_EQ(findings({0.3, 0.29, 0.28, 0.0179, 0.01}), "???..") << "it catches up";
  const std::string gap = findings(std::vector<double>(40, 1.0));
  EXPECT_NEAR(static_cast<double>(gap.find('J')), 25, 1) << "one second is missing: known after 0.5 s";
  EXPECT_EQ(gap.substr(gap.find('J') + 1), std::string(39 - gap.find('J'), '.'));
  EXPECT_EQ(findings({-0.01, -0.049, -0.12, -0.12}), "..J.") << "the clock was late";
}

// What one cycle of a sound server holds, when the clock is 3 ms late.
TEST(ArrivalJudge, ALostCycleOfASoundServerIsMissing) {
  const std::string gap = findings(std::vector<double>(40, 1024 / 48000.0 - 0.003));
  EXPECT_NEAR(static_cast<double>(gap.find('J')), 25, 1) << gap;
}

TEST(ArrivalJudge, NeverWaitsForMoreThanEightTenthsOfASecond) {
  std::vector<double> slowlyCatchingUp;  // one every 14 ms
  for (int i = 0; i < 60; ++i) slowlyCatchingUp.push_back(1 - i * 0.006);
  EXPECT_EQ(findings(slowlyCatchingUp).find('J'), 58U);
}

TEST(ClockFilter, FindsTheSpeedBelowAnyJitter) {
  for (const double ppm : {-300.0, -20.0, 0.0, 300.0}) {
    ClockFilter clock;
    double arrival = 5;
    for (int i = 0; i < 60000; ++i) {
      const double heard = i * 0.01;
      arrival = std::max(arrival, 5 + heard * (1 + ppm * 1e-6) + 0.002 * (i % 7) + (i % 501 == 0 ? 0.4 : 0));
      i == 0 ? clock.restart({heard, arrival}) : clock.observe({heard, arrival});
    }
    EXPECT_NEAR((clock.secondsPerSecond() - 1) * 1e6, ppm, 2) << ppm;
    EXPECT_NEAR(clock.timeAt(600), 5 + 600 * (1 + ppm * 1e-6), 0.0021) << ppm;  // never earlier than 2 ms
  }
}

TEST(ClockFilter, NoClockIsFurtherOffThanThreeThousandPartsInAMillion) {
  ClockFilter clock;
  clock.restart({0, 0});
  for (int i = 1; i < 6000; ++i) clock.observe({i * 0.01, i * 0.02});
  EXPECT_NEAR(clock.secondsPerSecond(), 1.003, 1e-9);
}

}  // namespace
}  // namespace lmx
