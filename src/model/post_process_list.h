// The queue of finished recordings that wait for their submission.
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
  /// Appends `job`.
  void postProcessListAddJob(std::shared_ptr<AgentSubmit> job);
  /// Takes the oldest job off the list; null when it is empty.
  std::shared_ptr<AgentSubmit> postProcessListNext();
  [[nodiscard]] std::size_t postProcessListCount() const;
  void clear();

 private:
  mutable std::mutex mutex_;
  std::deque<std::shared_ptr<AgentSubmit>> jobs_;  // guarded by mutex_
};

}  // namespace lmx
