// Time arithmetic.
#include "support/time_value.h"

#include <cstdlib>
#include <cstring>
#include <ctime>

namespace lmx {
namespace {

TimeValue* newTimeValue(TimeValue value) {
  auto* block = static_cast<TimeValue*>(std::malloc(sizeof(TimeValue)));
  if (block != nullptr) *block = value;
  return block;
}

constexpr suseconds_t kMicroseconds = 1000000;

}  // namespace

std::optional<TimeValue> currentTime() {
  TimeValue now{};
  if (gettimeofday(&now, nullptr) != 0) return std::nullopt;
  return now;
}

TimeValue* lmp_gettimeofday() {
  const auto now = currentTime();
  return now ? newTimeValue(*now) : nullptr;
}

std::int64_t lmp_diff_timeval(const TimeValue* a, const TimeValue* b) {
  const std::int64_t seconds = static_cast<std::int64_t>(a->tv_sec) - b->tv_sec;
  const std::int64_t microseconds = static_cast<std::int64_t>(a->tv_usec) - b->tv_usec;
  return (seconds * kMicroseconds + microseconds) / 1000;
}

TimeValue* lmp_timevalptr_from_timeval(const TimeValue* value) {
  return value == nullptr ? nullptr : newTimeValue(*value);
}

char* lmp_timeval_to_ctime(const TimeValue* value) {
  if (value == nullptr) return nullptr;
  char text[32];
  if (ctime_r(&value->tv_sec, text) == nullptr) return nullptr;
  text[std::strcspn(text, "\n")] = '\0';
  return strdup(text);
}

TimeValue* LXAgentTimevalAdd(const TimeValue* a, const TimeValue* b) {
  TimeValue sum{a->tv_sec + b->tv_sec, a->tv_usec + b->tv_usec};
  if (sum.tv_usec >= kMicroseconds) {
    sum.tv_usec -= kMicroseconds;
    ++sum.tv_sec;
  }
  return newTimeValue(sum);
}

TimeValue* LXAgentTimevalSubtract(const TimeValue* a, const TimeValue* b) {
  TimeValue difference{a->tv_sec - b->tv_sec, a->tv_usec - b->tv_usec};
  if (difference.tv_usec < 0) {
    difference.tv_usec += kMicroseconds;
    --difference.tv_sec;
  }
  return newTimeValue(difference);
}

double secondsSinceReferenceDate() {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return static_cast<double>(now.tv_sec) - kReferenceDateOffset + static_cast<double>(now.tv_nsec) / 1e9;
}

}  // namespace lmx
