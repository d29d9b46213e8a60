// Ends a recording whose deadline has passed.
#pragma once
#include <string>

#include "record/agent_record.h"
#include "record/stop_times.h"

namespace lmx {

/// Stops the recording when a deadline has passed. Runs on the capture thread every 15 seconds.
void checkForAutoShutoffConditions(AgentRecord& session);
/// What is known of the recording that is to be ended.
struct Deadlines {
  std::string request;  ///< AgentRecord::addressedRequest()
  StopTimes::Time hard;
  StopTimes::Time soft;
};
/// Ends the recording: marks the stop and waits for stopRecording on the main thread. Clears its deadlines,
/// but not those of a recording that has taken its place. In ad-hoc mode it ends the process. @return 0
int doAutoShutoff(AgentRecord& session, const Deadlines& known);

}  // namespace lmx
