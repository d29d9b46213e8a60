// The shared work queues: one-off work items on worker threads.
#pragma once
#include <functional>

namespace lmx {

enum class WorkPriority {
  background,  ///< niced threads: must not disturb a running capture
  standard,
};

/// Runs `item` on a worker of the process-wide pool of that priority; items may run in parallel. Thread-safe.
/// Workers are started on demand, live until the process ends and are never joined. An exception out of
/// an item ends the process: items catch their own.
void dispatchAsync(WorkPriority priority, std::function<void()> item);

/// The same, returning when `item` has run.
void dispatchSync(WorkPriority priority, const std::function<void()>& item);

}  // namespace lmx
