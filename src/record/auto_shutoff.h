// Ends a recording whose deadline has passed.
#pragma once
#include "record/agent_record.h"

namespace lmx {

/// Stops the recording when a deadline has passed. Capture thread, every 15 seconds.
void checkForAutoShutoffConditions(AgentRecord& session);
/// Ends the recording: marks the stop and waits for the main thread's stopRecording. Ends the process in
/// ad-hoc mode. Always 0.
int doAutoShutoff(AgentRecord& session);

}  // namespace lmx
