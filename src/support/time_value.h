// Time values: wall-clock seconds and microseconds since 1970-01-01 UTC, and their arithmetic.
#pragma once
#include <sys/time.h>

#include <cstdint>
#include <optional>
#include <string>

namespace lmx {

/// Seconds (64-bit) and microseconds, as in POSIX.
using TimeValue = timeval;

/// The current time of day; absent when the clock fails.
std::optional<TimeValue> lmp_gettimeofday();

/// `a` minus `b` in milliseconds, truncated toward zero; positive when `a` is later.
std::int64_t lmp_diff_timeval(const TimeValue& a, const TimeValue& b);

/// Local time in the format of ctime without the line feed, for log messages; "?" when it can't be formatted.
std::string lmp_timeval_to_ctime(const TimeValue& value);

/// a + b, with carry.
TimeValue LXAgentTimevalAdd(const TimeValue& a, const TimeValue& b);
/// a - b, with borrow.
TimeValue LXAgentTimevalSubtract(const TimeValue& a, const TimeValue& b);

/// Wall-clock time minus the time since boot (sleep included), in seconds. Changes only when the clock is
/// set.
std::int64_t wallClockOffset();

/// Seconds from 1970-01-01 to the reference date 2001-01-01, both 00:00 UTC.
inline constexpr double kReferenceDateOffset = 978307200.0;

/// Wall-clock time in seconds since 2001-01-01 00:00 UTC, the scale of every mark given to a capture
/// controller.
double secondsSinceReferenceDate();

}  // namespace lmx
