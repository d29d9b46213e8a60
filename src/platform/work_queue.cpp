// Worker threads, started on demand.
#include "platform/work_queue.h"

#include <pthread.h>
#include <sys/resource.h>
#include <unistd.h>

#include <condition_variable>
#include <deque>
#include <exception>
#include <memory>
#include <mutex>
#include <system_error>
#include <thread>

#include "platform/log.h"

namespace lmx {
namespace {

class Pool;
thread_local const Pool* pool_of_this_thread = nullptr;

class Pool {
 public:
  explicit Pool(WorkPriority priority) : priority_(priority) {}

  void add(std::function<void()> item) {
    {
      const std::lock_guard lock(mutex_);
      items_.push_back(std::move(item));
      if (idle_ < items_.size() && workers_ < kMaximumWorkers) startWorker();
      changed_.notify_one();
      if (workers_ > 0) return;
      // Not even one thread to be had: late on this one is better than never.
      item = std::move(items_.back());
      items_.pop_back();
    }
    runGuarded(item);
  }

  [[nodiscard]] bool ownsThisThread() const { return pool_of_this_thread == this; }

 private:
  static constexpr std::size_t kMaximumWorkers = 4;
  static constexpr int kNice = 10;

  /// Call with the lock held.
  void startWorker() {
    try {
      std::thread([this] { work(); }).detach();
      ++workers_;
    } catch (const std::system_error& error) {
      LMPLogMessage(nullptr, kLogCritical, "A worker thread could not be started: %s", error.what());
    }
  }

  void prepareThread() const {
    pool_of_this_thread = this;
    const bool background = priority_ == WorkPriority::background;
    pthread_setname_np(pthread_self(), background ? "lmx-background" : "lmx-work");
    // Linux takes a thread's identifier here. Without the right to do it the work is still done.
    if (background) setpriority(PRIO_PROCESS, static_cast<id_t>(gettid()), kNice);
  }

  [[noreturn]] void work() {
    prepareThread();
    for (;;) {
      std::function<void()> item;  // destroyed without the lock: what it holds may dispatch again
      {
        std::unique_lock lock(mutex_);
        ++idle_;
        changed_.wait(lock, [this] { return !items_.empty(); });
        --idle_;
        item = std::move(items_.front());
        items_.pop_front();
      }
      runGuarded(item);
    }
  }

  /// A failing item costs itself, not the process and whatever it is recording.
  static void runGuarded(const std::function<void()>& item) {
    try {
      item();
    } catch (const std::exception& error) {
      LMPLogMessage(nullptr, kLogCritical, "A work item failed: %s", error.what());
    }
  }

  const WorkPriority priority_;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<std::function<void()>> items_;  // guarded by mutex_
  std::size_t idle_ = 0;                     // guarded by mutex_
  std::size_t workers_ = 0;                  // guarded by mutex_
};

/// Never destroyed: workers run until the process has gone.
Pool& pool(WorkPriority priority) {
  static Pool& background = *std::make_unique<Pool>(WorkPriority::background).release();
  static Pool& standard = *std::make_unique<Pool>(WorkPriority::standard).release();
  return priority == WorkPriority::background ? background : standard;
}

}  // namespace

void dispatchAsync(WorkPriority priority, std::function<void()> item) { pool(priority).add(std::move(item)); }

void dispatchSync(WorkPriority priority, const std::function<void()>& item) {
  // A worker that waited for its own pool could wait for ever.
  if (pool(priority).ownsThisThread()) return item();
  std::mutex mutex;
  std::condition_variable changed;
  bool done = false;
  dispatchAsync(priority, [&] {
    item();
    const std::lock_guard lock(mutex);
    done = true;
    changed.notify_one();
  });
  std::unique_lock lock(mutex);
  changed.wait(lock, [&] { return done; });
}

}  // namespace lmx
