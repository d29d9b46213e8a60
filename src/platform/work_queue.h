// The shared work queue: one-off work items on worker threads in the background.
#pragma once
#include <functional>

namespace lmx {

/// Runs `item` on a worker of the process-wide pool; up to four items run in parallel. Workers are niced, so
/// that they do not disturb a running capture; they are started on demand, live until the process ends and
/// are never joined. An exception out of an item is a critical log line and ends that item alone.
/// Thread-safe.
void dispatchAsync(std::function<void()> item);

}  // namespace lmx
