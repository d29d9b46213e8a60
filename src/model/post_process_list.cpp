// The queue of finished recordings.
#include "model/post_process_list.h"

#include <utility>

namespace lmx {

void PostProcessList::postProcessListAddJob(std::shared_ptr<AgentSubmit> job) {
  const std::lock_guard lock(mutex_);
  jobs_.push_back(std::move(job));
}

std::shared_ptr<AgentSubmit> PostProcessList::postProcessListNext() {
  const std::lock_guard lock(mutex_);
  if (jobs_.empty()) return nullptr;
  auto job = std::move(jobs_.front());
  jobs_.pop_front();
  return job;
}

std::size_t PostProcessList::postProcessListCount() const {
  const std::lock_guard lock(mutex_);
  return jobs_.size();
}

void PostProcessList::clear() {
  std::deque<std::shared_ptr<AgentSubmit>> dropped;  // destroyed after unlocking: destructors run any code
  const std::lock_guard lock(mutex_);
  jobs_.swap(dropped);
}

}  // namespace lmx
