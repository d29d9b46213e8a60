// Records the calls of several doubles in the order in which they happened.
#pragma once
#include <mutex>
#include <string>
#include <vector>

namespace lmx::testing {

/// Thread-safe. Shared by doubles whose relative order matters to a test.
class Journal {
 public:
  void add(std::string entry) {
    const std::lock_guard lock(mutex_);
    entries_.push_back(std::move(entry));
  }
  [[nodiscard]] std::vector<std::string> entries() const {
    const std::lock_guard lock(mutex_);
    return entries_;
  }

 private:
  mutable std::mutex mutex_;
  std::vector<std::string> entries_;  // guarded by mutex_
};

}  // namespace lmx::testing
