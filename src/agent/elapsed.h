// Time spans on a wall clock that may be set in between.
#pragma once
#include <cstdint>

namespace lmx {

/// Whether the time `span` seconds after `begin` still lies ahead (seconds since 1970). If the clock was set
/// back to before `begin`, this is false: acting too early is better than an hour too late.
constexpr bool isAhead(std::int64_t now, std::int64_t begin, std::int64_t span) {
  return now >= begin && now - begin < span;
}

}  // namespace lmx
