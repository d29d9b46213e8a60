// The work queue.
#include "platform/work_queue.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <thread>

#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

/// Counts, and lets threads wait until a count is reached.
class Counter {
 public:
  int add(int difference) {
    const std::lock_guard lock(mutex_);
    value_ += difference;
    highest_ = std::max(highest_, value_);
    changed_.notify_all();
    return value_;
  }
  /// @return whether the count reached `value` within ten seconds
  [[nodiscard]] bool reaches(int value) {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, std::chrono::seconds(10), [&] { return value_ >= value; });
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

// The counters are static, because an item may run after the test has ended.

TEST(WorkQueue, ItemRunsOnAnotherThreadThatIsNiced) {
  static Counter done;
  static std::thread::id worker;
  static int nice = -100;
  dispatchAsync([] {
    worker = std::this_thread::get_id();
    nice = getpriority(PRIO_PROCESS, static_cast<id_t>(gettid()));
    done.add(1);
  });
  ASSERT_TRUE(done.reaches(1));
  EXPECT_NE(worker, std::this_thread::get_id());
  EXPECT_EQ(nice, std::max(getpriority(PRIO_PROCESS, static_cast<id_t>(gettid())), 10));
}

TEST(WorkQueue, FourItemsRunAtTheSameTime) {
  static Counter arrived;
  static Counter finished;
  for (int i = 0; i < 4; ++i) {
    dispatchAsync([] {
      arrived.add(1);
      if (arrived.reaches(4)) finished.add(1);
    });
  }
  EXPECT_TRUE(finished.reaches(4));
}

TEST(WorkQueue, NeverMoreThanFourRunAtATime) {
  static Counter running;
  static Counter finished;
  for (int i = 0; i < 200; ++i) {
    dispatchAsync([] {
      running.add(1);
      std::this_thread::yield();
      running.add(-1);
      finished.add(1);
    });
  }
  EXPECT_TRUE(finished.reaches(200));
  EXPECT_LE(running.highest(), 4);
}

TEST(WorkQueue, ItemMayDispatchAnother) {
  static Counter done;
  dispatchAsync([] { dispatchAsync([] { done.add(1); }); });
  EXPECT_TRUE(done.reaches(1));
}

TEST(WorkQueue, DestructorOfACaptureMayDispatch) {
  static Counter done;
  std::shared_ptr<void> held(nullptr, [](void*) { dispatchAsync([] { done.add(1); }); });
  dispatchAsync([held = std::move(held)] {});
  EXPECT_TRUE(done.reaches(1));
}

TEST(WorkQueue, ExceptionEndsOnlyItsItem) {
  static Counter done;
  testing::LogCapture log;
  dispatchAsync([] { throw std::runtime_error("no such thing"); });
  EXPECT_TRUE(log.waitFor(kLogCritical, "A work item failed: no such thing"));
  dispatchAsync([] { done.add(1); });
  EXPECT_TRUE(done.reaches(1));
}

}  // namespace
}  // namespace lmx
