// Waits for an effect of another thread.
#pragma once
#include <chrono>
#include <thread>

namespace lmx::testing {

/// Checks `condition` every millisecond. @return false when it is still false after half a minute
template <class Condition>
bool waitUntil(const Condition& condition) {
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
  while (!condition()) {
    if (std::chrono::steady_clock::now() >= deadline) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  return true;
}

}  // namespace lmx::testing
