// Time values: wall-clock seconds and microseconds since 1970-01-01 UTC, and their arithmetic.
#pragma once
#include <sys/time.h>

#include <cstdint>
#include <optional>
#include <string>

namespace lmx {

/// Seconds (64-bit) and microseconds, as POSIX has them.
using TimeValue = timeval;

/// The current time of day; absent when the clock fails.
std::optional<TimeValue> lmp_gettimeofday();

/// `a` minus `b` in milliseconds, truncated toward zero; positive when `a` is later.
std::int64_t lmp_diff_timeval(const TimeValue& a, const TimeValue& b);

/// The local time in the form of ctime, without its line feed, for log messages; "?" when it can't be formed.
std::string lmp_timeval_to_ctime(const TimeValue& value);

/// a + b, microseconds carried.
TimeValue LXAgentTimevalAdd(const TimeValue& a, const TimeValue& b);
/// a - b, microseconds borrowed.
TimeValue LXAgentTimevalSubtract(const TimeValue& a, const TimeValue& b);

/// Seconds that the wall clock is ahead of the time since the machine started (sleep included), which no
/// setting of the clock moves.
std::int64_t wallClockOffset();

/// Seconds between 1970-01-01 and the reference date 2001-01-01, both 00:00 UTC.
inline constexpr double kReferenceDateOffset = 978307200.0;

/// Wall clock as seconds since 2001-01-01 00:00 UTC: the scale of every mark given to a capture controller.
double secondsSinceReferenceDate();

}  // namespace lmx
