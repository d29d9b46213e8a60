// The text form of a date, as timers write and read it.
#pragma once
#include <ctime>
#include <optional>
#include <string>
#include <string_view>

namespace lmx {

/// `seconds` since 1970 as local time with the zone's offset, such as "2009-06-30 14:05:00 +0200"; nothing
/// when the year is out of range. Thread-safe.
std::optional<std::string> dateText(std::time_t seconds);

/// Parses the same form: year-month-day, a space, hours:minutes:seconds, a space, sign and four digits of
/// offset from UTC.
/// @return seconds since 1970; nothing for any other form and for dates that do not exist
std::optional<std::time_t> dateFromText(std::string_view text);

}  // namespace lmx
