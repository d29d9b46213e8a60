// The thread of one channel, and the descriptor that wakes it.
#pragma once
#include <atomic>
#include <functional>
#include <latch>
#include <mutex>
#include <thread>

#include "support/unique_fd.h"

namespace lmx {

/// Runs once. Thread-safe, but for start() and the destruction.
class ChannelThread {
 public:
  ChannelThread();
  /// Asks the thread to stop and waits for it. Never on the thread itself.
  ~ChannelThread();
  ChannelThread(const ChannelThread&) = delete;
  ChannelThread& operator=(const ChannelThread&) = delete;

  /// Whether there is a descriptor to wake it by; without one nothing could stop the thread.
  [[nodiscard]] bool canBeStopped() const { return wake_.valid(); }
  /// Runs `body` on a new thread. Call it once.
  /// @param body       returns soon once running() is false; throws nothing
  /// @param announce   runs on the calling thread before `body` begins; throws nothing
  /// @return false when the system has no thread for it
  [[nodiscard]] bool start(std::function<void()> body, const std::function<void()>& announce);

  /// Has running() turn false and the wake descriptor become readable. Never waits.
  void askToStop();
  /// Returns when the thread has ended; at once when it never began. Never on the thread itself.
  /// @return false when there never was a thread
  bool waitUntilEnded();

  /// Whether the thread is to go on.
  [[nodiscard]] bool running() const { return running_; }
  [[nodiscard]] bool hasEnded() const { return ended_; }
  [[nodiscard]] bool isCurrent() const { return id_.load() == std::this_thread::get_id(); }
  /// Readable once the thread is to stop: to be polled beside whatever it waits for.
  [[nodiscard]] int wakeDescriptor() const { return wake_.get(); }

 private:
  void live(const std::function<void()>& body) noexcept;

  UniqueFd wake_;  // eventfd, written by askToStop
  std::atomic<bool> running_{false};
  std::atomic<bool> ended_{true};
  std::atomic<std::thread::id> id_{};
  std::latch announced_{1};
  std::mutex mutex_;  // guards the two below
  bool started_ = false;
  std::thread thread_;
};

}  // namespace lmx
