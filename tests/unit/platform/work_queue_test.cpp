// Tests of the work queues.
#include "platform/work_queue.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <thread>

namespace lmx {
namespace {

/// Counts, and lets threads wait for a count.
class Counter {
 public:
  int add(int difference) {
    const std::lock_guard lock(mutex_);
    value_ += difference;
    highest_ = std::max(highest_, value_);
    changed_.notify_all();
    return value_;
  }
  void waitFor(int value) {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [&] { return value_ >= value; });
  }
  [[nodiscard]] int highest() {
    const std::lock_guard lock(mutex_);
    return highest_;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  int value_ = 0;
  int highest_ = 0;
};

class WorkQueue : public ::testing::TestWithParam<WorkPriority> {};

TEST_P(WorkQueue, ItemRunsOnAnotherThread) {
  std::thread::id worker;
  dispatchSync(GetParam(), [&] { worker = std::this_thread::get_id(); });
  EXPECT_NE(worker, std::thread::id());
  EXPECT_NE(worker, std::this_thread::get_id());
}

TEST_P(WorkQueue, FourItemsRunAtTheSameTime) {
  Counter arrived;
  Counter finished;
  for (int i = 0; i < 4; ++i) {
    dispatchAsync(GetParam(), [&] {
      arrived.add(1);
      arrived.waitFor(4);  // hangs unless all four run together
      finished.add(1);
    });
  }
  finished.waitFor(4);
}

TEST_P(WorkQueue, NeverMoreThanFourRunAtATime) {
  Counter running;
  Counter finished;
  for (int i = 0; i < 200; ++i) {
    dispatchAsync(GetParam(), [&] {
      running.add(1);
      std::this_thread::yield();
      running.add(-1);
      finished.add(1);
    });
  }
  finished.waitFor(200);
  EXPECT_LE(running.highest(), 4);
}

TEST_P(WorkQueue, ItemMayDispatchAnother) {
  Counter done;
  dispatchAsync(GetParam(), [&] { dispatchAsync(GetParam(), [&] { done.add(1); }); });
  done.waitFor(1);
}

TEST_P(WorkQueue, WhatAnItemHoldsMayDispatchAtItsEnd) {
  Counter done;
  std::shared_ptr<void> held(nullptr, [&](void*) { dispatchAsync(GetParam(), [&] { done.add(1); }); });
  dispatchAsync(GetParam(), [held = std::move(held)] {});
  done.waitFor(1);
}

TEST_P(WorkQueue, WorkersMayWaitForTheirOwnPool) {
  Counter done;
  for (int i = 0; i < 8; ++i) {
    dispatchAsync(GetParam(), [&] {
      dispatchSync(GetParam(), [&] { done.add(1); });
      done.add(1);
    });
  }
  done.waitFor(16);
}

INSTANTIATE_TEST_SUITE_P(BothPriorities, WorkQueue,
                         ::testing::Values(WorkPriority::background, WorkPriority::standard),
                         [](const auto& param) {
                           return param.param == WorkPriority::background ? "background" : "standard";
                         });

int niceOfThisThread() { return getpriority(PRIO_PROCESS, static_cast<id_t>(gettid())); }

TEST(WorkQueueThreads, BackgroundIsNicedAndStandardIsNot) {
  const int here = niceOfThisThread();
  int background = -100;
  int standard = -100;
  dispatchSync(WorkPriority::background, [&] { background = niceOfThisThread(); });
  dispatchSync(WorkPriority::standard, [&] { standard = niceOfThisThread(); });
  EXPECT_EQ(background, std::max(here, 10));
  EXPECT_EQ(standard, here);
}

}  // namespace
}  // namespace lmx
