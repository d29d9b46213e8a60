// How long a channel waits before it tries its server again.
#pragma once
#include <algorithm>
#include <chrono>

namespace lmx {

inline constexpr std::chrono::seconds kFirstBackOff{5};

/// Delay before the next attempt: three times the last one, at most two minutes.
constexpr std::chrono::seconds nextBackOff(std::chrono::seconds last) noexcept {
  using namespace std::chrono_literals;
  return last > 119s ? last : std::min<std::chrono::seconds>(3 * last, 120s);
}

}  // namespace lmx
