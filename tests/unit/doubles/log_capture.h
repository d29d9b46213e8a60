// Collects log messages for a test and waits for them.
#pragma once
#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string>
#include <vector>

#include "platform/log.h"

namespace lmx::testing {

/// Receives every log message of the process while it lives. One at a time. Thread-safe.
class LogCapture {
 public:
  struct Entry {
    int level;
    std::string text;
    bool operator==(const Entry&) const = default;
  };

  LogCapture() { setLogSinkForTesting(&LogCapture::take, this); }
  ~LogCapture() { setLogSinkForTesting(nullptr, nullptr); }
  LogCapture(const LogCapture&) = delete;
  LogCapture& operator=(const LogCapture&) = delete;

  [[nodiscard]] std::vector<Entry> entries() const {
    const std::lock_guard lock(mutex_);
    return entries_;
  }
  [[nodiscard]] std::ptrdiff_t count(int level, const std::string& text) const {
    const std::lock_guard lock(mutex_);
    return std::count(entries_.begin(), entries_.end(), Entry{level, text});
  }
  [[nodiscard]] bool contains(int level, const std::string& text) const { return count(level, text) > 0; }
  /// Whether any message contains `part`.
  [[nodiscard]] bool mentions(const std::string& part) const {
    const std::lock_guard lock(mutex_);
    return std::any_of(entries_.begin(), entries_.end(),
                       [&](const Entry& e) { return e.text.find(part) != std::string::npos; });
  }
  /// Waits until the message has been logged `times` times. @return false when it is still missing after half
  /// a minute
  bool waitFor(int level, const std::string& text, std::ptrdiff_t times = 1) {
    std::unique_lock lock(mutex_);
    return changed_.wait_until(lock, std::chrono::system_clock::now() + std::chrono::seconds(30), [&] {
      return std::count(entries_.begin(), entries_.end(), Entry{level, text}) >= times;
    });
  }
  /// Waits until a message contains `part`. @return false when none does within half a minute
  bool waitForPart(const std::string& part) {
    std::unique_lock lock(mutex_);
    return changed_.wait_until(lock, std::chrono::system_clock::now() + std::chrono::seconds(30), [&] {
      return std::any_of(entries_.begin(), entries_.end(),
                         [&](const Entry& e) { return e.text.find(part) != std::string::npos; });
    });
  }

 private:
  static void take(void* user, int level, const std::string& text) {
    auto* self = static_cast<LogCapture*>(user);
    const std::lock_guard lock(self->mutex_);
    self->entries_.push_back({level, text});
    self->changed_.notify_all();
  }

  mutable std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<Entry> entries_;  // guarded by mutex_
};

}  // namespace lmx::testing
