// Ends a recording whose deadline has passed.
#pragma once
#include "record/agent_record.h"

namespace lmx {

/// Stops the recording when a deadline has passed. Runs on the capture thread every 15 seconds.
void checkForAutoShutoffConditions(AgentRecord& session);
/// Ends the recording: marks the stop and waits for stopRecording on the main thread. In ad-hoc mode it ends
/// the process. @return 0
int doAutoShutoff(AgentRecord& session);

}  // namespace lmx
