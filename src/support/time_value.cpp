// Time arithmetic and the text of time values.
#include "support/time_value.h"

#include <ctime>
#include <limits>

#include "support/format.h"

namespace lmx {
namespace {

constexpr std::int64_t kMicrosPerSecond = 1000000;

std::int64_t saturated(bool negative) {
  return negative ? std::numeric_limits<std::int64_t>::min() : std::numeric_limits<std::int64_t>::max();
}
std::int64_t add(std::int64_t a, std::int64_t b) {
  std::int64_t sum = 0;
  return __builtin_add_overflow(a, b, &sum) ? saturated(b < 0) : sum;
}
std::int64_t subtract(std::int64_t a, std::int64_t b) {
  std::int64_t difference = 0;
  return __builtin_sub_overflow(a, b, &difference) ? saturated(a < b) : difference;
}

/// Normalises `micros` to 0 … 999999 and carries whole seconds.
TimeValue normalised(std::int64_t seconds, std::int64_t micros) {
  std::int64_t carry = micros / kMicrosPerSecond;
  micros %= kMicrosPerSecond;
  if (micros < 0) {
    micros += kMicrosPerSecond;
    --carry;
  }
  TimeValue value{};
  value.tv_sec = add(seconds, carry);
  value.tv_usec = micros;
  return value;
}

}  // namespace

std::optional<TimeValue> lmp_gettimeofday() {
  TimeValue now{};
  if (gettimeofday(&now, nullptr) != 0) return std::nullopt;
  return now;
}

std::int64_t lmp_diff_timeval(const TimeValue& a, const TimeValue& b) {
  const std::int64_t seconds = subtract(a.tv_sec, b.tv_sec);
  const std::int64_t micros = subtract(a.tv_usec, b.tv_usec);
  std::int64_t total = 0;
  if (!__builtin_mul_overflow(seconds, kMicrosPerSecond, &total) &&
      !__builtin_add_overflow(total, micros, &total)) {
    return total / 1000;
  }
  // Microseconds overflow at this distance. Count whole milliseconds and saturate.
  if (__builtin_mul_overflow(seconds, std::int64_t{1000}, &total)) return saturated(seconds < 0);
  return add(total, micros / 1000);
}

std::string lmp_timeval_to_ctime(const TimeValue& value) {
  // Not ctime_r, whose buffer has no room for years of more than four digits.
  static constexpr const char* kDays[] = {"Sun", "Mon", "Tue", "Wed", "Thu", "Fri", "Sat"};
  static constexpr const char* kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                            "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  const std::time_t seconds = value.tv_sec;
  std::tm local{};
  if (localtime_r(&seconds, &local) == nullptr) return "?";
  return string_with_format("%s %s %2d %02d:%02d:%02d %lld", kDays[local.tm_wday], kMonths[local.tm_mon],
                            local.tm_mday, local.tm_hour, local.tm_min, local.tm_sec, 1900LL + local.tm_year);
}

TimeValue LXAgentTimevalAdd(const TimeValue& a, const TimeValue& b) {
  return normalised(add(a.tv_sec, b.tv_sec), add(a.tv_usec, b.tv_usec));
}

TimeValue LXAgentTimevalSubtract(const TimeValue& a, const TimeValue& b) {
  return normalised(subtract(a.tv_sec, b.tv_sec), subtract(a.tv_usec, b.tv_usec));
}

std::int64_t wallClockOffset() {
  std::timespec wall{};
  std::timespec boot{};
  clock_gettime(CLOCK_REALTIME, &wall);
  clock_gettime(CLOCK_BOOTTIME, &boot);
  return wall.tv_sec - boot.tv_sec;
}

double secondsSinceReferenceDate() {
  std::timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  // Subtract before adding the fraction, which loses less precision.
  return (static_cast<double>(now.tv_sec) - kReferenceDateOffset) + static_cast<double>(now.tv_nsec) * 1e-9;
}

}  // namespace lmx
