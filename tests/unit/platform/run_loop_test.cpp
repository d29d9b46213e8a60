// The run loop.
#include "platform/run_loop.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <atomic>
#include <fstream>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "platform/log.h"
#include "support/unique_fd.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;
using Turn = RunLoop::Turn;
using Clock = std::chrono::steady_clock;

class Pipe {
 public:
  Pipe() {
    int ends[2] = {-1, -1};
    EXPECT_EQ(pipe(ends), 0);
    reading.reset(ends[0]);
    writing.reset(ends[1]);
  }
  void put() const { EXPECT_EQ(write(writing.get(), "x", 1), 1); }
  void take() const {
    char c = 0;
    EXPECT_EQ(read(reading.get(), &c, 1), 1);
  }
  UniqueFd reading;
  UniqueFd writing;
};

/// A thread that posts an action and waits for it. Construction returns once it is waiting.
class WaitingPoster {
 public:
  WaitingPoster(RunLoop& loop, RunLoop::Action action) {
    thread_ = std::thread([this, &loop, action = std::move(action)] {
      tid_ = gettid();
      result_ = loop.post(action, Wait::untilDone);
    });
    // The thread sleeps only while it waits for the action.
    while (!sleeping()) std::this_thread::yield();
  }
  bool result() {
    thread_.join();
    return result_;
  }

 private:
  [[nodiscard]] bool sleeping() const {
    if (tid_ == 0) return false;
    std::ifstream stat("/proc/self/task/" + std::to_string(tid_) + "/stat");
    std::string text((std::istreambuf_iterator<char>(stat)), {});
    const auto end = text.rfind(") ");
    return end != std::string::npos && text[end + 2] == 'S';
  }
  std::thread thread_;
  std::atomic<pid_t> tid_{0};
  bool result_ = false;
};

TEST(RunLoop, PostedActionsRunInOrderOnePerTurn) {
  RunLoop loop;
  std::string order;
  for (const char c : {'a', 'b', 'c'}) EXPECT_TRUE(loop.post([&, c] { order += c; }, Wait::no));
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_EQ(order, "a");
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_EQ(order, "abc");
  EXPECT_EQ(loop.run(0ms), Turn::timedOut);
}

TEST(RunLoop, TurnWithoutASourceLastsItsLimit) {
  RunLoop loop;
  const auto begin = Clock::now();
  EXPECT_EQ(loop.run(30ms), Turn::timedOut);
  EXPECT_GE(Clock::now() - begin, 30ms);
}

TEST(RunLoop, LimitsOutOfRangeAreHarmless) {
  RunLoop loop;
  EXPECT_EQ(loop.run(-5ms), Turn::timedOut);
  loop.post([] {}, Wait::no);
  EXPECT_EQ(loop.run(std::chrono::milliseconds::max()), Turn::handledSource);
}

TEST(RunLoop, PostFromAnotherThreadWakesIt) {
  RunLoop loop;
  std::thread poster([&] { loop.post([] {}, Wait::no); });
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  poster.join();
}

TEST(RunLoop, PosterWaitsUntilTheActionHasRun) {
  RunLoop loop;
  bool ran = false;
  WaitingPoster poster(loop, [&] { ran = true; });
  EXPECT_FALSE(ran);
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_TRUE(poster.result());
  EXPECT_TRUE(ran);
}

TEST(RunLoop, WaitingOnTheOwnerThreadRunsAtOnce) {
  RunLoop loop;
  loop.adoptThread();
  bool ran = false;
  EXPECT_TRUE(loop.post([&] { ran = true; }, Wait::untilDone));
  EXPECT_TRUE(ran);
}

TEST(RunLoop, RunMakesTheCallerTheOwner) {
  RunLoop loop;
  EXPECT_FALSE(loop.isOwnerThread());
  loop.run(0ms);
  EXPECT_TRUE(loop.isOwnerThread());
  bool elsewhere = true;
  std::thread([&] { elsewhere = loop.isOwnerThread(); }).join();
  EXPECT_FALSE(elsewhere);
}

TEST(RunLoop, StopReleasesWaitersAndRefusesPosts) {
  RunLoop loop;
  loop.adoptThread();
  bool ran = false;
  WaitingPoster poster(loop, [&] { ran = true; });
  loop.stop();
  EXPECT_FALSE(poster.result());
  EXPECT_FALSE(loop.post([&] { ran = true; }, Wait::no));
  EXPECT_FALSE(loop.post([&] { ran = true; }, Wait::untilDone));
  EXPECT_EQ(loop.run(1h), Turn::stopped);
  EXPECT_FALSE(ran);
}

TEST(RunLoop, StopWakesATurn) {
  RunLoop loop;
  std::thread stopper([&] { loop.stop(); });
  EXPECT_EQ(loop.run(1h), Turn::stopped);
  stopper.join();
}

TEST(RunLoop, DestructionReleasesWaiters) {
  auto loop = std::make_unique<RunLoop>();
  WaitingPoster poster(*loop, [] {});
  loop.reset();
  EXPECT_FALSE(poster.result());
}

TEST(RunLoop, ActionDroppedAtTheStopMayUseTheLoop) {
  RunLoop loop;
  bool refused = false;
  std::shared_ptr<void> held(nullptr, [&](void*) { refused = !loop.post([] {}, Wait::no); });
  loop.post([held = std::move(held)] {}, Wait::no);
  loop.stop();
  EXPECT_TRUE(refused);
}

TEST(RunLoop, ThrowingActionCountsAsRun) {
  const testing::LogCapture log;
  RunLoop loop;
  WaitingPoster poster(loop, [] { throw std::runtime_error("broken"); });
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_TRUE(poster.result());
  EXPECT_TRUE(log.contains(kLogCritical, "An action of the run loop failed: broken"));
  EXPECT_TRUE(loop.post([] { throw 1; }, Wait::untilDone));
  EXPECT_TRUE(log.contains(kLogCritical, "An action of the run loop failed"));
}

TEST(RunLoop, TimerRunsAfterEachInterval) {
  RunLoop loop;
  int beats = 0;
  const auto begin = Clock::now();
  const auto timer = loop.addRepeatingTimer(10ms, [&] { ++beats; });
  EXPECT_EQ(loop.run(0ms), Turn::timedOut);
  for (int i = 1; i <= 3; ++i) {
    EXPECT_EQ(loop.run(1h), Turn::handledSource);
    EXPECT_EQ(beats, i);
    EXPECT_GE(Clock::now() - begin, i * 10ms);
  }
}

TEST(RunLoop, MissedTimerIntervalsAreNotMadeUp) {
  RunLoop loop;
  int beats = 0;
  const auto timer = loop.addRepeatingTimer(500ms, [&] { ++beats; });
  std::this_thread::sleep_for(1100ms);  // nothing to wait for: only time must pass
  EXPECT_EQ(loop.run(0ms), Turn::handledSource);
  EXPECT_EQ(loop.run(0ms), Turn::timedOut);
  EXPECT_EQ(beats, 1);
}

TEST(RunLoop, RemovedTimerIsSilent) {
  RunLoop loop;
  bool ran = false;
  auto timer = loop.addRepeatingTimer(1ms, [&] { ran = true; });
  timer.reset();
  EXPECT_EQ(loop.run(20ms), Turn::timedOut);
  EXPECT_FALSE(ran);
}

TEST(RunLoop, TimerMayRemoveItselfAndKeepsItsCapturesMeanwhile) {
  RunLoop loop;
  std::unique_ptr<RunLoop::Source> timer;
  int seen = 0;
  timer = loop.addRepeatingTimer(1ms, [&timer, &seen, held = std::make_shared<int>(7)] {
    timer.reset();
    seen = *held;
  });
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_EQ(seen, 7);
  EXPECT_EQ(loop.run(10ms), Turn::timedOut);
}

TEST(RunLoop, ActionsMayAddSources) {
  RunLoop loop;
  const Pipe pipe;
  std::vector<std::unique_ptr<RunLoop::Source>> added;
  bool read = false;
  const auto timer = loop.addRepeatingTimer(1h, [] {});
  const auto first = loop.addRepeatingTimer(1ms, [&] {
    added.push_back(loop.watchReadable(pipe.reading.get(), [&] { read = true; }));
    for (int i = 0; i < 100; ++i) added.push_back(loop.addRepeatingTimer(1h, [] {}));
    pipe.put();
  });
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_EQ(added.size(), 101U);
  for (int i = 0; i < 1000 && !read; ++i) loop.run(1h);
  EXPECT_TRUE(read);
}

TEST(RunLoop, WatchRunsWhenReadable) {
  RunLoop loop;
  const Pipe pipe;
  int runs = 0;
  const auto watch = loop.watchReadable(pipe.reading.get(), [&] {
    pipe.take();
    ++runs;
  });
  EXPECT_EQ(loop.run(0ms), Turn::timedOut);
  pipe.put();
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_EQ(runs, 1);
  EXPECT_EQ(loop.run(0ms), Turn::timedOut);
}

TEST(RunLoop, WatchRunsWhenTheOtherEndIsGone) {
  RunLoop loop;
  Pipe pipe;
  bool ran = false;
  auto watch = loop.watchReadable(pipe.reading.get(), [&] { ran = true; });
  pipe.writing.reset();
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_TRUE(ran);
}

TEST(RunLoop, PostedActionsGoBeforeTimersAndWatches) {
  RunLoop loop;
  const Pipe pipe;
  std::string order;
  const auto watch = loop.watchReadable(pipe.reading.get(), [&] {
    pipe.take();
    order += 'w';
  });
  auto timer = loop.addRepeatingTimer(1ms, [&] { order += 't'; });
  pipe.put();
  std::this_thread::sleep_for(5ms);  // the timer is due
  loop.post([&] { order += 'p'; }, Wait::no);
  loop.run(0ms);
  loop.run(0ms);
  timer.reset();
  loop.run(0ms);
  EXPECT_EQ(order, "ptw");
}

TEST(RunLoop, BusyDescriptorDoesNotStarveOthers) {
  RunLoop loop;
  const Pipe busy;
  const Pipe other;
  bool served = false;
  const auto first = loop.watchReadable(busy.reading.get(), [] {});  // never read, so always ready
  const auto second = loop.watchReadable(other.reading.get(), [&] {
    other.take();
    served = true;
  });
  busy.put();
  other.put();
  loop.run(0ms);
  loop.run(0ms);
  EXPECT_TRUE(served);
}

TEST(RunLoop, DescriptorClosedUnderItsWatchIsReportedOnce) {
  const testing::LogCapture log;
  RunLoop loop;
  Pipe pipe;
  bool ran = false;
  const auto watch = loop.watchReadable(pipe.reading.get(), [&] { ran = true; });
  const int fd = pipe.reading.get();
  pipe.reading.reset();
  EXPECT_EQ(loop.run(20ms), Turn::timedOut);
  EXPECT_EQ(loop.run(20ms), Turn::timedOut);
  EXPECT_FALSE(ran);
  EXPECT_EQ(log.count(kLogCritical,
                      "Descriptor " + std::to_string(fd) + " was closed while the run loop watched it"),
            1);
}

TEST(RunLoop, TurnsMayBeNestedInAnAction) {
  RunLoop loop;
  std::string order;
  loop.post(
      [&] {
        order += '<';
        EXPECT_EQ(loop.run(1h), Turn::handledSource);
        order += '>';
      },
      Wait::no);
  loop.post([&] { order += 'x'; }, Wait::no);
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_EQ(order, "<x>");
  EXPECT_EQ(loop.run(0ms), Turn::timedOut);
}

TEST(RunLoop, NestedTurnSkipsRunningSources) {
  RunLoop loop;
  const Pipe pipe;
  int depth = 0;
  int deepest = 0;
  const auto nest = [&] {
    deepest = std::max(deepest, ++depth);
    loop.run(5ms);
    --depth;
  };
  const auto watch = loop.watchReadable(pipe.reading.get(), nest);
  pipe.put();
  EXPECT_EQ(loop.run(1h), Turn::handledSource);
  EXPECT_EQ(deepest, 1);
}

TEST(RunLoop, WaiterIsServedByANestedTurn) {
  RunLoop loop;
  bool ran = false;
  std::unique_ptr<WaitingPoster> poster;
  loop.post(
      [&] {
        poster = std::make_unique<WaitingPoster>(loop, [&] { ran = true; });
        loop.run(1h);
        EXPECT_TRUE(ran);
      },
      Wait::no);
  loop.run(1h);
  EXPECT_TRUE(poster->result());
}

TEST(RunLoop, NoPostIsLostWithManyPosters) {
  RunLoop loop;
  constexpr int kThreads = 4;
  constexpr int kEach = 500;
  int total = 0;  // used on this thread only
  std::atomic<int> running{kThreads};
  std::vector<std::thread> posters;
  posters.reserve(kThreads);
  for (int t = 0; t < kThreads; ++t) {
    posters.emplace_back([&] {
      for (int i = 0; i < kEach; ++i) {
        EXPECT_TRUE(loop.post([&] { ++total; }, i % 10 == 0 ? Wait::untilDone : Wait::no));
      }
      --running;
      loop.post([] {}, Wait::no);
    });
  }
  while (running > 0) loop.run(1h);
  while (loop.run(0ms) == Turn::handledSource) {
  }
  for (std::thread& poster : posters) poster.join();
  EXPECT_EQ(total, kThreads * kEach);
}

TEST(RunLoop, NothingToDoMeansNoWakeUps) {
  RunLoop loop;
  const auto timer = loop.addRepeatingTimer(1h, [] {});
  loop.post([] {}, Wait::no);
  loop.run(1h);
  rusage before{};
  rusage after{};
  getrusage(RUSAGE_THREAD, &before);
  EXPECT_EQ(loop.run(200ms), Turn::timedOut);
  getrusage(RUSAGE_THREAD, &after);
  EXPECT_LE(after.ru_nvcsw - before.ru_nvcsw, 1);
}

}  // namespace
}  // namespace lmx
