// Spans of the wall clock, which may be set in between.
#pragma once
#include <cstdint>

namespace lmx {

/// Whether the moment `span` seconds after `begin` is still to come (seconds since 1970). A clock that was
/// set back behind `begin` knows nothing of it: rather too early than an hour too late.
constexpr bool isAhead(std::int64_t now, std::int64_t begin, std::int64_t span) {
  return now >= begin && now - begin < span;
}

}  // namespace lmx
