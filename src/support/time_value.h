// Time values: wall-clock seconds and microseconds since 1970-01-01 UTC, and their arithmetic.
#pragma once
#include <sys/time.h>

#include <cstdint>
#include <optional>

namespace lmx {

/// Seconds (64-bit) and microseconds, as POSIX has them.
using TimeValue = timeval;

/// The current time of day in a new block that the caller frees; null when memory or the clock fails.
TimeValue* lmp_gettimeofday();

/// `a` minus `b` in milliseconds, truncated toward zero; positive when `a` is later.
std::int64_t lmp_diff_timeval(const TimeValue* a, const TimeValue* b);

/// A copy of `value` in a new block that the caller frees; null when memory fails or `value` is null.
TimeValue* lmp_timevalptr_from_timeval(const TimeValue* value);

/// The local time in the form of ctime, without its line feed, in a new block that the caller frees;
/// null when it can't be formed. For log messages.
char* lmp_timeval_to_ctime(const TimeValue* value);

/// a + b, microseconds carried; a new block that the caller frees.
TimeValue* LXAgentTimevalAdd(const TimeValue* a, const TimeValue* b);
/// a - b, microseconds borrowed; a new block that the caller frees.
TimeValue* LXAgentTimevalSubtract(const TimeValue* a, const TimeValue* b);

/// lmp_gettimeofday as a value; empty when the clock fails.
std::optional<TimeValue> currentTime();

/// Seconds between 1970-01-01 and the reference date 2001-01-01, both 00:00 UTC.
inline constexpr double kReferenceDateOffset = 978307200.0;

/// Wall clock as seconds since 2001-01-01 00:00 UTC: the scale of every mark given to a capture controller.
double secondsSinceReferenceDate();

}  // namespace lmx
