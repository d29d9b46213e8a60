// Waiting for something that another thread brings about.
#pragma once
#include <chrono>
#include <thread>

namespace lmx::testing {

/// Looks every millisecond. @return false when `condition` has not come true within half a minute.
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
