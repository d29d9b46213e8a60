// Worker threads, started on demand.
#include "platform/work_queue.h"

#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <condition_variable>
#include <deque>
#include <mutex>
#include <thread>

namespace lmx {
namespace {

class Pool {
 public:
  explicit Pool(bool nice) : nice_(nice) {}

  void add(std::function<void()> item) {
    const std::lock_guard lock(mutex_);
    items_.push_back(std::move(item));
    if (idle_ < items_.size() && workers_ < kMaxWorkers) {
      ++workers_;
      std::thread([this] { work(); }).detach();
    }
    changed_.notify_one();
  }

 private:
  static constexpr std::size_t kMaxWorkers = 4;
  static constexpr int kNice = 10;

  void work() {
    if (nice_) setpriority(PRIO_PROCESS, static_cast<id_t>(syscall(SYS_gettid)), kNice);
    std::unique_lock lock(mutex_);
    for (;;) {
      ++idle_;
      changed_.wait(lock, [this] { return !items_.empty(); });
      --idle_;
      const auto item = std::move(items_.front());
      items_.pop_front();
      lock.unlock();
      item();
      lock.lock();
    }
  }

  const bool nice_;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<std::function<void()>> items_;  // guarded by mutex_
  std::size_t idle_ = 0;                     // guarded by mutex_
  std::size_t workers_ = 0;                  // guarded by mutex_
};

Pool& pool(WorkPriority priority) {
  static auto* background = new Pool(true);  // workers outlive main: never destroyed
  static auto* standard = new Pool(false);
  return priority == WorkPriority::background ? *background : *standard;
}

}  // namespace

void dispatchAsync(WorkPriority priority, std::function<void()> item) { pool(priority).add(std::move(item)); }

void dispatchSync(WorkPriority priority, const std::function<void()>& item) {
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
