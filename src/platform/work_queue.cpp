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

class Pool {
 public:
  void add(std::function<void()> item) {
    {
      const std::lock_guard lock(mutex_);
      items_.push_back(std::move(item));
      if (idle_ < items_.size() && workers_ < kMaximumWorkers) startWorker();
      changed_.notify_one();
      if (workers_ > 0) return;
      // No thread could be started. Running the item late on this thread is better than never.
      item = std::move(items_.back());
      items_.pop_back();
    }
    runGuarded(item);
  }

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

  static void prepareThread() {
    pthread_setname_np(pthread_self(), "lmx-background");
    // On Linux this sets the priority of one thread. Without permission the work is still done.
    setpriority(PRIO_PROCESS, static_cast<id_t>(gettid()), kNice);
  }

  [[noreturn]] void work() {
    prepareThread();
    for (;;) {
      std::function<void()> item;  // destroyed without the lock: its captures may dispatch again
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

  /// An exception ends the item, not the process and its recording.
  static void runGuarded(const std::function<void()>& item) {
    try {
      item();
    } catch (const std::exception& error) {
      LMPLogMessage(nullptr, kLogCritical, "A work item failed: %s", error.what());
    }
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<std::function<void()>> items_;  // guarded by mutex_
  std::size_t idle_ = 0;                     // guarded by mutex_
  std::size_t workers_ = 0;                  // guarded by mutex_
};

/// Never destroyed: workers run until the process ends.
Pool& pool() {
  static Pool& pool = *std::make_unique<Pool>().release();
  return pool;
}

}  // namespace

void dispatchAsync(std::function<void()> item) { pool().add(std::move(item)); }

}  // namespace lmx
