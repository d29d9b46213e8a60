// Stops a recording according to its type and updates the session.
#include "record/stop_capture.h"

#include <chrono>
#include <thread>

#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "platform/log.h"
#include "record/capture_thread.h"
#include "record/engine_environment.h"
#include "record/status_lock.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

/// Waits until the controller has shut down, or until `deadline`.
void waitForShutDown(const std::shared_ptr<LMRCaptureController>& controller,
                     std::chrono::steady_clock::time_point deadline) {
  while (controller && !controller->hasShutDown() && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(20ms);
  }
}

/// Stops a capture of the framework through the main thread. @return the agent's result
int stopFrameworkCapture(AgentRecord& session, const std::shared_ptr<LMRCaptureController>& controller) {
  const EngineEnvironment environment = engineEnvironment();
  const auto deadline = std::chrono::steady_clock::now() + 10s;
  int result = kRecordSuccess;
  if (environment.context && environment.context->options.adhoc.get()) {
    if (controller) controller->stopRecording();
  } else {
    if (environment.actions != nullptr) environment.actions->perform(&AgentActions::stopCapture, Wait::no);
    while (session.status.get() != kRecorderIdle && std::chrono::steady_clock::now() < deadline) {
      std::this_thread::sleep_for(50ms);
    }
    result = environment.context ? environment.context->state.status.get() : kRecordInvalidType;
  }
  waitForShutDown(controller, deadline);
  return result;
}

int stopByType(AgentRecord& session, const std::shared_ptr<LMRCaptureController>& controller) {
  if (session.status.get() != kRecorderRecording && session.status.get() != kRecorderPaused) {
    LMPLogMessage(nullptr, kLogError, "Unable to stop, capture not running");
    reportRuntimeError(kRecordNotRunning);
    return kRecordNotRunning;
  }
  if (const auto thread = session.captureThread.get()) {
    thread->cancel();
    session.captureThread.set(nullptr);
  }
  const std::int32_t type = session.recordedType();
  if (type == kRecordingTypeFile) return kRecordSuccess;
  if (type < kRecordingTypeAudio || type > kRecordingTypeFile) {
    reportRuntimeError(kRecordInvalidType);
    return kRecordInvalidType;
  }
  const int result = stopFrameworkCapture(session, controller);
  if (result != kRecordSuccess && result != kRecordAcceptedAtStop) {
    LMPLogMessage(nullptr, kLogError, "_LXAgentRecordStopCaptureSync received error");
  }
  return result;
}

/// Sets the stop time to now, adds the time since the start to the elapsed time, and sets the status to idle.
void closeTimes(AgentRecord& session) {
  const auto now = lmp_gettimeofday();
  session.stopTime.set(now);
  const auto start = session.startTime.get();
  if (now && start) {
    const TimeValue before = session.elapsedTime.get().value_or(TimeValue{});
    session.elapsedTime.set(LXAgentTimevalAdd(before, LXAgentTimevalSubtract(*now, *start)));
  }
  session.status.set(kRecorderIdle);
}

}  // namespace

int LXAgentRecordStopCapture(const std::shared_ptr<AgentRecord>& session) {
  if (!session) return invalidArguments("LXAgentRecordStopCapture");
  const auto controller = session->captureController.get();
  double elapsed = 0;
  if (controller) {
    controller->setStopWithUUID(session->recording_uuid.get());
    elapsed = controller->elapsedTimeForRequestWithUUID(session->recording_uuid.get());
  }
  const int result = stopByType(*session, controller);
  if (result == kRecordSuccess || result == kRecordAcceptedAtStop) closeTimes(*session);

  const StatusAndTimingLock lock(*session);
  if (!lock.locked()) return kRecordLockFailed;
  if (result != kRecordSuccess) {
    session->error.set(result);
  } else if (AgentActions* actions = engineEnvironment().actions) {
    actions->recordDidStopWithFile(session, session->filename.get().value_or(""), session->metadata.get(),
                                   session->beginning(), static_cast<std::int64_t>(elapsed),
                                   session->stopTime.get(), false);
  }
  return result;
}

std::optional<TimeValue> shiftedNow(const AgentContext& context) {
  auto now = lmp_gettimeofday();
  if (now) now->tv_sec -= context.state.timeshift_seconds.get();
  return now;
}

}  // namespace lmx
