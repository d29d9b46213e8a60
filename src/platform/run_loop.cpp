// The run loop, built on a queue, an eventfd and poll.
#include "platform/run_loop.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <optional>
#include <thread>
#include <vector>

#include "platform/log.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;
constexpr std::chrono::milliseconds kLongestTurn = std::chrono::hours(24);

/// The outcome that the poster of an action waits for. May outlive the loop.
class Waiter {
 public:
  void finish(bool ran) {
    const std::lock_guard lock(mutex_);
    done_ = true;
    ran_ = ran;
    changed_.notify_all();
  }
  bool wait() {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return done_; });
    return ran_;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  bool done_ = false;  // guarded by mutex_
  bool ran_ = false;   // guarded by mutex_
};

struct Posted {
  RunLoop::Action action;
  std::shared_ptr<Waiter> waiter;  ///< null when the poster doesn't wait
};

/// A timer or a descriptor watch. It is not run again while its action runs, so that a nested turn can't
/// recurse into it.
struct Entry {
  RunLoop::Action action;
  int fd = -1;                 ///< watches only
  Clock::duration interval{};  ///< timers only
  Clock::time_point due{};     ///< timers only
  bool running = false;
  bool removed = false;
};
using Entries = std::vector<std::shared_ptr<Entry>>;

/// Shares the entry with the loop, which removes it at its next turn.
class EntrySource : public RunLoop::Source {
 public:
  explicit EntrySource(std::shared_ptr<Entry> entry) : entry_(std::move(entry)) {}
  EntrySource(const EntrySource&) = delete;
  EntrySource& operator=(const EntrySource&) = delete;
  ~EntrySource() override {
    entry_->removed = true;
    // A running action must keep its captures. The loop drops them afterwards.
    if (!entry_->running) entry_->action = nullptr;
  }

 private:
  std::shared_ptr<Entry> entry_;
};

/// An exception ends the action, not the loop.
void runGuarded(const RunLoop::Action& action) {
  try {
    action();
  } catch (const std::exception& error) {
    LMPLogMessage(nullptr, kLogCritical, "An action of the run loop failed: %s", error.what());
  } catch (...) {
    LMPLogMessage(nullptr, kLogCritical, "An action of the run loop failed");
  }
}

void runEntry(const std::shared_ptr<Entry>& entry) {
  entry->running = true;
  runGuarded(entry->action);
  entry->running = false;
  if (entry->removed) entry->action = nullptr;
}

/// The next due time after `now`, in phase with the earlier ones.
Clock::time_point nextBeat(const Entry& timer, Clock::time_point now) {
  return timer.due + timer.interval * ((now - timer.due) / timer.interval + 1);
}

}  // namespace

struct RunLoop::Impl {
  UniqueFd wake{eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)};
  std::atomic<std::thread::id> owner{};
  std::mutex mutex;
  std::deque<Posted> queue;  // guarded by mutex
  bool rung = false;         // guarded by mutex; true while `wake` is readable
  bool stopped = false;      // guarded by mutex
  Entries timers;            // owner thread
  Entries watches;           // owner thread

  /// Call with the lock held.
  void ring() {
    if (rung) return;
    const std::uint64_t one = 1;
    rung = write(wake.get(), &one, sizeof one) == sizeof one;
  }
  /// Takes the next posted action. @return false when the loop has stopped
  bool takePosted(std::optional<Posted>& posted);
  bool runDueTimer();
  /// Waits for a descriptor, a post or `deadline`. @return whether a watch's action ran
  bool pollWatches(Clock::time_point deadline);
  [[nodiscard]] Clock::time_point nextDue(Clock::time_point deadline) const;
  void forgetRemoved();
};

RunLoop::RunLoop() : impl_(std::make_unique<Impl>()) {}
RunLoop::~RunLoop() { stop(); }

void RunLoop::adoptThread() { impl_->owner = std::this_thread::get_id(); }
bool RunLoop::isOwnerThread() const { return impl_->owner.load() == std::this_thread::get_id(); }

bool RunLoop::post(Action action, Wait wait) {
  const bool waits = wait == Wait::untilDone;
  const bool inline_run = waits && isOwnerThread();
  const auto waiter = waits && !inline_run ? std::make_shared<Waiter>() : nullptr;
  {
    const std::lock_guard lock(impl_->mutex);
    if (impl_->stopped) return false;
    if (!inline_run) {
      impl_->queue.push_back({std::move(action), waiter});
      impl_->ring();
    }
  }
  if (inline_run) runGuarded(action);  // NOLINT: moved from only when it does not run here
  return waiter == nullptr || waiter->wait();
}

void RunLoop::stop() {
  std::deque<Posted> dropped;  // destroyed without the lock: destructors of the captures may run any code
  {
    const std::lock_guard lock(impl_->mutex);
    impl_->stopped = true;
    dropped.swap(impl_->queue);
    impl_->ring();
  }
  for (const Posted& posted : dropped) {
    if (posted.waiter) posted.waiter->finish(false);
  }
}

bool RunLoop::Impl::takePosted(std::optional<Posted>& posted) {
  const std::lock_guard lock(mutex);
  if (stopped) return false;
  if (rung) {
    // Reset before looking at the queue: a later post signals again, and no wake-up is spurious.
    std::uint64_t count = 0;
    [[maybe_unused]] const ssize_t n = read(wake.get(), &count, sizeof count);
    rung = false;
  }
  if (queue.empty()) return true;
  posted = std::move(queue.front());
  queue.pop_front();
  return true;
}

bool RunLoop::Impl::runDueTimer() {
  const auto now = Clock::now();
  for (const auto& timer : timers) {
    if (timer->running || timer->removed || timer->due > now) continue;
    const auto held = timer;  // the action may add timers, which invalidates iterators
    held->due = nextBeat(*held, now);
    runEntry(held);
    return true;
  }
  return false;
}

Clock::time_point RunLoop::Impl::nextDue(Clock::time_point deadline) const {
  for (const auto& timer : timers) {
    if (!timer->running && !timer->removed) deadline = std::min(deadline, timer->due);
  }
  return deadline;
}

bool RunLoop::Impl::pollWatches(Clock::time_point deadline) {
  std::vector<pollfd> polled{{wake.get(), POLLIN, 0}};
  // poll skips negative descriptors, so indices match those of the list.
  for (const auto& watch : watches) polled.push_back({watch->running ? -1 : watch->fd, POLLIN, 0});
  const auto left = std::max(Clock::duration::zero(), nextDue(deadline) - Clock::now());
  const auto seconds = std::chrono::floor<std::chrono::seconds>(left);
  const timespec timeout{seconds.count(), std::chrono::nanoseconds(left - seconds).count()};
  if (ppoll(polled.data(), polled.size(), &timeout, nullptr) <= 0) return false;
  for (std::size_t i = 0; i < watches.size(); ++i) {
    const short events = polled[i + 1].revents;
    if (events == 0) continue;
    const auto watch = watches[i];
    if ((events & POLLNVAL) != 0) {
      LMPLogMessage(nullptr, kLogCritical, "Descriptor %d was closed while the run loop watched it",
                    watch->fd);
      watch->fd = -1;  // otherwise poll would return at once every time
      return false;
    }
    // Move to the end of the list, so that a busy descriptor can't starve the others.
    std::rotate(watches.begin() + static_cast<std::ptrdiff_t>(i),
                watches.begin() + static_cast<std::ptrdiff_t>(i) + 1, watches.end());
    runEntry(watch);
    return true;
  }
  return false;
}

void RunLoop::Impl::forgetRemoved() {
  const auto removed = [](const std::shared_ptr<Entry>& entry) { return entry->removed; };
  std::erase_if(timers, removed);
  std::erase_if(watches, removed);
}

RunLoop::Turn RunLoop::run(std::chrono::milliseconds limit) {
  adoptThread();
  const auto deadline = Clock::now() + std::clamp(limit, std::chrono::milliseconds(0), kLongestTurn);
  for (bool last = false;; last = Clock::now() >= deadline) {
    std::optional<Posted> posted;
    if (!impl_->takePosted(posted)) return Turn::stopped;
    if (posted) {
      runGuarded(posted->action);
      posted->action = nullptr;  // release the captures before the poster continues
      if (posted->waiter) posted->waiter->finish(true);
      return Turn::handledSource;
    }
    impl_->forgetRemoved();
    if (impl_->runDueTimer()) return Turn::handledSource;
    if (last) return Turn::timedOut;
    if (impl_->pollWatches(deadline)) return Turn::handledSource;
  }
}

std::unique_ptr<RunLoop::Source> RunLoop::addRepeatingTimer(std::chrono::milliseconds interval,
                                                            Action action) {
  auto timer = std::make_shared<Entry>();
  timer->action = std::move(action);
  timer->interval = std::clamp(interval, std::chrono::milliseconds(1), kLongestTurn);
  timer->due = Clock::now() + timer->interval;
  impl_->timers.push_back(timer);
  return std::make_unique<EntrySource>(std::move(timer));
}

std::unique_ptr<RunLoop::Source> RunLoop::watchReadable(int fd, Action action) {
  auto watch = std::make_shared<Entry>();
  watch->action = std::move(action);
  watch->fd = fd;
  impl_->watches.push_back(watch);
  return std::make_unique<EntrySource>(std::move(watch));
}

}  // namespace lmx
