// How long a channel waits before it tries its server again.
#include "control/channel/back_off.h"

#include <gtest/gtest.h>

namespace lmx {
namespace {

using namespace std::chrono_literals;

TEST(BackOff, TriplesUpToTwoMinutes) {
  static_assert(nextBackOff(5s) == 15s);
  EXPECT_EQ(nextBackOff(15s), 45s);
  EXPECT_EQ(nextBackOff(45s), 120s);
  EXPECT_EQ(nextBackOff(120s), 120s);
  EXPECT_EQ(nextBackOff(200s), 200s);
}

}  // namespace
}  // namespace lmx
