// Sets and checks the deadlines of a recording.
#include "record/stop_times.h"

#include <algorithm>
#include <cstdlib>
#include <limits>

#include "platform/log.h"

namespace lmx {
namespace {

void logTime(const char* what, const TimeValue& time) {
  LMPLogMessage(nullptr, kLogInfo, "%s%s", what, lmp_timeval_to_ctime(time).c_str());
}

/// Now plus `seconds`; absent (logged) when the clock fails.
StopTimes::Time deadlineIn(std::int32_t seconds) {
  auto time = lmp_gettimeofday();
  if (!time) {
    LMPLogMessage(nullptr, kLogError, "lmp_gettimeofday returned NULL");
    return std::nullopt;
  }
  time->tv_sec += seconds;
  return time;
}

}  // namespace

void StopTimes::followWallClock(std::int64_t offset) {
  constexpr std::int64_t kRounding = 1;  // both offsets are truncated to whole seconds
  const std::lock_guard lock(clock_mutex_);
  const std::int64_t step = clock_offset_ ? offset - *clock_offset_ : 0;
  clock_offset_ = offset;
  if (std::abs(step) <= kRounding) return;
  bool moved = false;
  for (auto* deadline : {&hardStopTime, &softStopTime}) {
    Time time = deadline->get();
    if (!time) continue;
    time->tv_sec += step;
    deadline->set(time);
    moved = true;
  }
  if (moved) {
    LMPLogMessage(nullptr, kLogNotice,
                  "The clock was set by %lld s, the stop times of the recording go with it",
                  static_cast<long long>(step));
  }
}

void StopTimes::updateSoftStopTime() {
  followWallClock(wallClockOffset());
  softStopTime.set(std::nullopt);
  const std::int32_t minutes = maxUnattendedRecordingMinutes.get();
  if (minutes <= 0) return;
  constexpr std::int64_t kMost = std::numeric_limits<std::int32_t>::max();  // as for the hard stop
  const Time deadline = deadlineIn(static_cast<std::int32_t>(std::min(std::int64_t{minutes} * 60, kMost)));
  if (!deadline) return;
  softStopTime.set(deadline);
  logTime("unattended stop time set to: ", *deadline);
}

void StopTimes::setRecordHardStopTimeSeconds(std::int32_t seconds) {
  followWallClock(wallClockOffset());
  hardStopTime.set(std::nullopt);
  if (seconds <= 0) return;
  const Time deadline = deadlineIn(seconds);
  if (!deadline) return;
  hardStopTime.set(deadline);
  logTime("hardStopTime set to: ", *deadline);
}

void StopTimes::clear() {
  hardStopTime.set(std::nullopt);
  softStopTime.set(std::nullopt);
}

void StopTimes::clearPassedDeadlines() {
  const auto now = lmp_gettimeofday();
  if (!now) return;
  if (const Time hard = hardStopTime.get(); hard && lmp_diff_timeval(*hard, *now) <= 0) {
    hardStopTime.set(std::nullopt);
  }
  if (const Time soft = softStopTime.get(); soft && soft->tv_sec <= now->tv_sec)
    softStopTime.set(std::nullopt);
}

bool StopTimes::shouldStopRecording() {
  followWallClock(wallClockOffset());
  const auto now = lmp_gettimeofday();
  if (!now) return false;
  bool stop = false;
  if (const Time hard = hardStopTime.get(); hard && lmp_diff_timeval(*hard, *now) <= 0) {
    LMPLogMessage(nullptr, kLogNotice, "Agent recording hit hard stop time");
    stop = true;
  }
  if (const Time soft = softStopTime.get()) {
    const std::int64_t diff = static_cast<std::int64_t>(soft->tv_sec) - now->tv_sec;
    if (diff < 1) {
      LMPLogMessage(nullptr, kLogNotice, "Agent recording hit soft stop time: %s, diff: %lld",
                    lmp_timeval_to_ctime(*soft).c_str(), static_cast<long long>(diff));
      stop = true;
    }
  }
  return stop;
}

void StopTimes::take(const StopTimes& other) {
  hardStopTime.set(other.hardStopTime.get());
  softStopTime.set(other.softStopTime.get());
  maxUnattendedRecordingMinutes.set(other.maxUnattendedRecordingMinutes.get());
}

}  // namespace lmx
