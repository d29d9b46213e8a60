// Stops the agent's only recording.
#pragma once
#include <memory>
#include <optional>

#include "model/agent_context.h"
#include "record/agent_record.h"
#include "support/time_value.h"

namespace lmx {

/// Stops the session's recording. Any thread; on the main thread only for a "File" recording, since for any
/// other it waits up to ten seconds for the main thread. @return a RecordError
int LXAgentRecordStopCapture(const std::shared_ptr<AgentRecord>& session);

/// The stop time of a finished recording: now minus the time shift.
std::optional<TimeValue> shiftedNow(const AgentContext& context);

}  // namespace lmx
