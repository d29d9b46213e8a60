// The queue of finished recordings that wait for submission.
#pragma once
#include <cstddef>
#include <deque>
#include <memory>
#include <mutex>

namespace lmx {

class AgentSubmit;

/// First in, first out. Thread-safe.
class PostProcessList {
 public:
  void postProcessListAddJob(std::shared_ptr<AgentSubmit> job);
  /// Removes and returns the oldest job; null when the list is empty.
  std::shared_ptr<AgentSubmit> postProcessListNext();
  [[nodiscard]] std::size_t postProcessListCount() const;
  void clear();

 private:
  mutable std::mutex mutex_;
  std::deque<std::shared_ptr<AgentSubmit>> jobs_;  // guarded by mutex_
};

}  // namespace lmx
