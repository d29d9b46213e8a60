// The shared queue for background work.
#pragma once
#include <functional>

namespace lmx {

/// Runs `item` on a worker of the process-wide pool; up to four items run in parallel. Workers run at lower
/// priority (nice), so that they don't disturb a running capture. They are started on demand, live until the
/// process ends and are never joined. A std::exception from an item is logged as critical and ends only that
/// item. Thread-safe.
void dispatchAsync(std::function<void()> item);

}  // namespace lmx
