// The run loop: a queue, an eventfd and poll.
#include "platform/run_loop.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <deque>
#include <list>
#include <mutex>
#include <thread>
#include <vector>

#include "platform/log.h"
#include "support/unique_fd.h"

namespace lmx {

using Clock = std::chrono::steady_clock;

namespace {

/// A posted action and, when somebody waits for it, its outcome.
struct Posted {
  RunLoop::Action action;
  bool waited = false;
  bool done = false;
  bool ran = false;
};

struct Timer {
  Clock::duration interval;
  Clock::time_point due;
  RunLoop::Action action;
};

struct Watch {
  int fd;
  RunLoop::Action action;
};

void runGuarded(const RunLoop::Action& action) {
  try {
    action();
  } catch (const std::exception& error) {
    LMPLogMessage(nullptr, kLogCritical, "An action of the run loop failed: %s", error.what());
  } catch (...) {
    LMPLogMessage(nullptr, kLogCritical, "An action of the run loop failed");
  }
}

}  // namespace

struct RunLoop::Impl {
  UniqueFd wake{eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)};
  std::atomic<std::thread::id> owner{};
  std::mutex mutex;
  std::condition_variable changed;
  std::deque<std::shared_ptr<Posted>> queue;  // guarded by mutex
  bool stopped = false;                       // guarded by mutex
  int waiters = 0;                            // guarded by mutex
  std::list<std::shared_ptr<Timer>> timers;   // owner thread
  std::list<std::shared_ptr<Watch>> watches;  // owner thread

  void ring() const {
    const std::uint64_t one = 1;
    [[maybe_unused]] const ssize_t n = write(wake.get(), &one, sizeof one);
  }
  void quiet() const {
    std::uint64_t count = 0;
    [[maybe_unused]] const ssize_t n = read(wake.get(), &count, sizeof count);
  }
  void stop();
  bool runPosted();
  bool runDueTimer();
  bool runReadyWatch(const std::vector<std::shared_ptr<Watch>>& order, const std::vector<pollfd>& polled);
  [[nodiscard]] int waitMilliseconds(Clock::time_point deadline) const;
};

RunLoop::RunLoop() : impl_(std::make_unique<Impl>()) {}

RunLoop::~RunLoop() {
  stop();
  std::unique_lock lock(impl_->mutex);
  impl_->changed.wait(lock, [this] { return impl_->waiters == 0; });
}

void RunLoop::adoptThread() { impl_->owner = std::this_thread::get_id(); }
bool RunLoop::isOwnerThread() const { return impl_->owner.load() == std::this_thread::get_id(); }

bool RunLoop::post(Action action, Wait wait) {
  if (wait == Wait::untilDone && isOwnerThread()) {
    runGuarded(action);
    return true;
  }
  auto posted = std::make_shared<Posted>();
  posted->action = std::move(action);
  posted->waited = wait == Wait::untilDone;
  std::unique_lock lock(impl_->mutex);
  if (impl_->stopped) return false;
  impl_->queue.push_back(posted);
  impl_->ring();
  if (wait == Wait::no) return true;
  ++impl_->waiters;
  impl_->changed.wait(lock, [&] { return posted->done; });
  --impl_->waiters;
  impl_->changed.notify_all();
  return posted->ran;
}

void RunLoop::Impl::stop() {
  std::deque<std::shared_ptr<Posted>> dropped;
  {
    const std::lock_guard lock(mutex);
    stopped = true;
    dropped.swap(queue);
    for (const auto& posted : dropped) posted->done = true;
    changed.notify_all();
  }
  ring();
}

void RunLoop::stop() { impl_->stop(); }

bool RunLoop::Impl::runPosted() {
  std::shared_ptr<Posted> posted;
  {
    const std::lock_guard lock(mutex);
    if (queue.empty()) return false;
    posted = std::move(queue.front());
    queue.pop_front();
    if (!queue.empty()) ring();
  }
  runGuarded(posted->action);
  const std::lock_guard lock(mutex);
  posted->action = nullptr;
  posted->ran = posted->done = true;
  if (posted->waited) changed.notify_all();
  return true;
}

bool RunLoop::Impl::runDueTimer() {
  const auto now = Clock::now();
  for (const auto& timer : timers) {
    if (timer->due > now) continue;
    const auto held = timer;  // it may remove itself
    held->due = now + held->interval;
    runGuarded(held->action);
    return true;
  }
  return false;
}

bool RunLoop::Impl::runReadyWatch(const std::vector<std::shared_ptr<Watch>>& order,
                                  const std::vector<pollfd>& polled) {
  for (std::size_t i = 0; i < order.size(); ++i) {
    if (polled[i + 1].revents == 0) continue;
    if (std::find(watches.begin(), watches.end(), order[i]) == watches.end()) continue;
    runGuarded(order[i]->action);
    return true;
  }
  return false;
}

int RunLoop::Impl::waitMilliseconds(Clock::time_point deadline) const {
  for (const auto& timer : timers) deadline = std::min(deadline, timer->due);
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count();
  return static_cast<int>(std::clamp<std::int64_t>(left, 0, 3600000));
}

RunLoop::Turn RunLoop::run(std::chrono::milliseconds limit) {
  adoptThread();
  const auto deadline = Clock::now() + limit;
  for (;;) {
    {
      const std::lock_guard lock(impl_->mutex);
      if (impl_->stopped) return Turn::stopped;
    }
    if (impl_->runPosted() || impl_->runDueTimer()) return Turn::handledSource;
    const std::vector<std::shared_ptr<Watch>> order(impl_->watches.begin(), impl_->watches.end());
    std::vector<pollfd> polled{{impl_->wake.get(), POLLIN, 0}};
    for (const auto& watch : order) polled.push_back({watch->fd, POLLIN, 0});
    const int ready = poll(polled.data(), polled.size(), impl_->waitMilliseconds(deadline));
    if (ready > 0) {
      if (polled[0].revents != 0) impl_->quiet();
      if (impl_->runReadyWatch(order, polled)) return Turn::handledSource;
    } else if (Clock::now() >= deadline) {
      return impl_->runDueTimer() ? Turn::handledSource : Turn::timedOut;
    }
  }
}

namespace {

template <class Item>
class ListedSource : public RunLoop::Source {
 public:
  ListedSource(std::list<std::shared_ptr<Item>>& list, std::shared_ptr<Item> item)
      : list_(list), item_(item) {
    list_.push_back(std::move(item));
  }
  ~ListedSource() override { list_.remove(item_); }

 private:
  std::list<std::shared_ptr<Item>>& list_;
  std::shared_ptr<Item> item_;
};

}  // namespace

std::unique_ptr<RunLoop::Source> RunLoop::addRepeatingTimer(std::chrono::milliseconds interval,
                                                            Action action) {
  auto timer = std::make_shared<Timer>(Timer{interval, Clock::now() + interval, std::move(action)});
  return std::make_unique<ListedSource<Timer>>(impl_->timers, std::move(timer));
}

std::unique_ptr<RunLoop::Source> RunLoop::watchReadable(int fd, Action action) {
  auto watch = std::make_shared<Watch>(Watch{fd, std::move(action)});
  return std::make_unique<ListedSource<Watch>>(impl_->watches, std::move(watch));
}

}  // namespace lmx
