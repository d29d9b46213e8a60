// Notices that a call takes too long.
#pragma once
#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <thread>

namespace lmx {

/// Stands beside a call that may never return: unless it is destroyed first, `tell` is called once after
/// `limit`, on a thread of its own. The destructor waits for a `tell` that has begun.
class Overdue {
 public:
  /// Throws std::system_error when there is no thread to be had.
  Overdue(std::chrono::milliseconds limit, std::function<void()> tell);
  ~Overdue();
  Overdue(const Overdue&) = delete;
  Overdue& operator=(const Overdue&) = delete;

 private:
  void wait(std::chrono::milliseconds limit);
  const std::function<void()> tell_;
  std::mutex mutex_;
  std::condition_variable changed_;
  bool over_ = false;   // guarded by mutex_
  std::thread thread_;  ///< last: it uses the others
};

}  // namespace lmx
