// What becomes of a call that takes long.
#include "capture/source/overdue.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>

namespace lmx {
namespace {

using namespace std::chrono_literals;

TEST(Overdue, IsToldOnceWhileTheCallStillRuns) {
  std::atomic<int> told{0};
  std::promise<void> first;
  {
    const Overdue overdue(1ms, [&] {
      if (++told == 1) first.set_value();
    });
    ASSERT_EQ(first.get_future().wait_for(20s), std::future_status::ready);
  }
  EXPECT_EQ(told, 1);
}

TEST(Overdue, ACallThatReturnsInTimeIsNoMatterAndWaitsForNothing) {
  bool told = false;
  const auto begin = std::chrono::steady_clock::now();
  {
    const Overdue overdue(1h, [&] { told = true; });
  }
  EXPECT_FALSE(told);
  EXPECT_LT(std::chrono::steady_clock::now() - begin, 20s);
}

TEST(Overdue, TheEndWaitsForWhatIsBeingTold) {
  std::promise<void> begun;
  std::promise<void> goOn;
  bool told = false;
  std::thread caller;
  {
    const Overdue overdue(1ms, [&] {
      begun.set_value();
      goOn.get_future().wait();
      told = true;
    });
    begun.get_future().wait();
    caller = std::thread([&] { goOn.set_value(); });
  }
  EXPECT_TRUE(told);
  caller.join();
}

}  // namespace
}  // namespace lmx
