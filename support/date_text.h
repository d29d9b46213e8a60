// Points of time as the timers write them.
#pragma once
#include <ctime>
#include <optional>
#include <string>

namespace lmx {

/// `seconds` since 1970 in local time with the zone's offset, as in "2009-06-30 14:05:00 +0200"; nothing when
/// the year can't be told. Thread-safe.
std::optional<std::string> dateText(std::time_t seconds);

}  // namespace lmx
