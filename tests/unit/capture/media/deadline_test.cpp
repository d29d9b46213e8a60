// The moment at which waiting ends.
#include "capture/media/deadline.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

using namespace std::chrono_literals;

TEST(Deadline, TheEarliestMomentCounts) {
  Deadline deadline;
  EXPECT_FALSE(deadline.passed());
  deadline.set(Deadline::Clock::now() + 1h);
  EXPECT_FALSE(deadline.passed());
  deadline.set(Deadline::Clock::now());
  EXPECT_TRUE(deadline.passed());
  deadline.set(Deadline::Clock::now() + 1h);
  EXPECT_TRUE(deadline.passed()) << "what has passed stays so";
}

}  // namespace
}  // namespace lmx
