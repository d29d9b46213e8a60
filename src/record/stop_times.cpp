// The deadlines that end what nobody ended: hard stop and soft stop.
#include <cinttypes>
#include <cstdlib>
#include <ctime>
#include <mutex>

#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "platform/log.h"
#include "record/agent_record.h"
#include "record/engine.h"
#include "record/stop_times.h"
#include "support/heap_ptr.h"

namespace lmx {
namespace {

void logTime(const char* format, const TimeValue& time) {
  const heap_ptr<char> text(lmp_timeval_to_ctime(&time));
  const std::string line = std::string(format) + (text ? text.get() : "?");
  LMPLogMessage(nullptr, kLogInfo, "%s", line.c_str());
}

bool same(const AgentRecord::Time& a, const AgentRecord::Time& b) {
  return a.has_value() == b.has_value() && (!a || (a->tv_sec == b->tv_sec && a->tv_usec == b->tv_usec));
}

/// Now plus `seconds`; absent (logged) when the clock fails.
AgentRecord::Time deadlineIn(std::int32_t seconds) {
  auto time = currentTime();
  if (!time) {
    LMPLogMessage(nullptr, kLogError, "lmp_gettimeofday returned NULL");
    return std::nullopt;
  }
  time->tv_sec += seconds;
  return time;
}

}  // namespace

std::int64_t wallClockOffset() {
  timespec wall{};
  timespec boot{};
  ::clock_gettime(CLOCK_REALTIME, &wall);
  ::clock_gettime(CLOCK_BOOTTIME, &boot);
  return wall.tv_sec - boot.tv_sec;
}

void AgentRecord::updateLastContact() {
  setLastContact(currentTime());
  if (status() != kRecorderIdle) updateSoftStopTime();
}

void AgentRecord::followWallClock(std::int64_t offset) {
  constexpr std::int64_t kRounding = 1;  // of two times that are cut to seconds
  const std::lock_guard lock(clock_mutex_);
  const std::int64_t step = clock_offset_ ? offset - *clock_offset_ : 0;
  clock_offset_ = offset;
  if (std::abs(step) <= kRounding) return;
  bool moved = false;
  for (auto* deadline : {&hardStopTime_, &softStopTime_}) {
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

void AgentRecord::updateSoftStopTime() {
  followWallClock(wallClockOffset());
  setSoftStopTime(std::nullopt);
  const std::int32_t minutes = maxUnattendedRecordingMinutes();
  if (minutes <= 0) return;
  // 32 bits wrap: a limit of more than 68 years is as good as any other.
  const auto seconds = static_cast<std::int32_t>(static_cast<std::uint32_t>(minutes) * 60U);
  const Time deadline = deadlineIn(seconds);
  if (!deadline) return;
  setSoftStopTime(deadline);
  logTime("unattended stop time set to: ", *deadline);
}

void AgentRecord::setRecordHardStopTimeSeconds(std::int32_t seconds) {
  followWallClock(wallClockOffset());
  setHardStopTime(std::nullopt);
  if (seconds <= 0) return;
  const Time deadline = deadlineIn(seconds);
  if (!deadline) return;
  setHardStopTime(deadline);
  logTime("hardStopTime set to: ", *deadline);
}

void AgentRecord::clearPassedDeadlines() {
  const auto now = currentTime();
  if (!now) return;
  if (const Time hard = hardStopTime(); hard && lmp_diff_timeval(&*hard, &*now) <= 0)
    setHardStopTime(std::nullopt);
  if (const Time soft = softStopTime(); soft && soft->tv_sec <= now->tv_sec) setSoftStopTime(std::nullopt);
}

AgentRecord::Time AgentRecord::beginning() const {
  const Time start = startTime();
  const Time launch = launchTime();
  if (!start || (launch && lmp_diff_timeval(&*start, &*launch) < 0)) return launch;
  return start;
}

bool AgentRecord::shouldStopRecording() {
  followWallClock(wallClockOffset());
  const auto now = currentTime();
  if (!now) return false;
  bool stop = false;
  if (const Time hard = hardStopTime(); hard && lmp_diff_timeval(&*hard, &*now) <= 0) {
    LMPLogMessage(nullptr, kLogNotice, "Agent recording hit hard stop time");
    stop = true;
  }
  if (const Time soft = softStopTime()) {
    const std::int64_t diff = static_cast<std::int64_t>(soft->tv_sec) - now->tv_sec;
    if (diff < 1) {
      const heap_ptr<char> text(lmp_timeval_to_ctime(&*soft));
      LMPLogMessage(nullptr, kLogNotice, "Agent recording hit soft stop time: %s, diff: %lld",
                    text ? text.get() : "?", static_cast<long long>(diff));
      stop = true;
    }
  }
  return stop;
}

void AgentRecord::checkForAutoShutoffConditions() {
  if (!shouldStopRecording()) return;
  LMPLogMessage(nullptr, kLogNotice, "Doing Auto-Shutoff: Video");
  doAutoShutoff();
}

int AgentRecord::doAutoShutoff() {
  const EngineEnvironment environment = engineEnvironment();
  if (environment.context && environment.context->adhoc()) std::_Exit(0);
  const Time hard = hardStopTime();
  const Time soft = softStopTime();
  if (const auto controller = captureController()) {
    controller->setStopWithUUID(request_uuid(), secondsSinceReferenceDate());
  }
  if (environment.actions != nullptr)
    environment.actions->perform(&AgentActions::stopRecording, Wait::untilDone);
  // Meanwhile the session may have gone on to the next recording: its deadlines are not these.
  if (same(hardStopTime(), hard)) setHardStopTime(std::nullopt);
  if (same(softStopTime(), soft)) setSoftStopTime(std::nullopt);
  return 0;
}

}  // namespace lmx
