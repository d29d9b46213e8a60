// Points of time as the timers write and read them.
#pragma once
#include <ctime>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// `seconds` since 1970 in local time with the zone's offset, as in "2009-06-30 14:05:00 +0200"; nothing when
/// the year can't be told. Thread-safe.
std::optional<std::string> dateText(std::time_t seconds);

/// The same form read back: year-month-day, a blank, hours:minutes:seconds, a blank, sign and four digits of
/// offset from UTC. @return seconds since 1970; nothing for any other form and for dates that do not exist
std::optional<std::time_t> dateFromText(std::string_view text);

}  // namespace lmx
