// Stops recordings automatically.
#include "record/auto_shutoff.h"

#include <cstdlib>

#include "capture/api/capture_framework.h"
#include "platform/log.h"
#include "record/engine_environment.h"

namespace lmx {
namespace {

/// Clears `deadline` if it still equals `known`. The session may have moved on to the next recording.
void forget(SharedValue<StopTimes::Time>& deadline, const StopTimes::Time& known) {
  const auto now = deadline.get();
  const bool same = now.has_value() == known.has_value() &&
                    (!now || (now->tv_sec == known->tv_sec && now->tv_usec == known->tv_usec));
  if (same) deadline.set(std::nullopt);
}

}  // namespace

void checkForAutoShutoffConditions(AgentRecord& session) {
  // Before the check: the session may move on to the next recording at any time, which must not be stopped
  // for this one's deadlines.
  const Deadlines known{.request = session.addressedRequest(),
                        .hard = session.stop_times.hardStopTime.get(),
                        .soft = session.stop_times.softStopTime.get()};
  if (!session.stop_times.shouldStopRecording()) return;
  LMPLogMessage(nullptr, kLogNotice, "Doing Auto-Shutoff: Video");
  doAutoShutoff(session, known);
}

int doAutoShutoff(AgentRecord& session, const Deadlines& known) {
  const EngineEnvironment environment = engineEnvironment();
  if (environment.context && environment.context->options.adhoc.get()) std::_Exit(0);
  if (const auto controller = session.captureController.get()) {
    controller->setStopWithUUID(known.request, secondsSinceReferenceDate());
    controller->submitRequestWithUUID(known.request);
  }
  if (environment.actions != nullptr) {
    environment.actions->performFor(known.request, &AgentActions::stopRecording, Wait::untilDone);
  }
  forget(session.stop_times.hardStopTime, known.hard);
  forget(session.stop_times.softStopTime, known.soft);
  return 0;
}

}  // namespace lmx
