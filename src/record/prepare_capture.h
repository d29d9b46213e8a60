// Prepares and starts the agent's only recording.
#pragma once
#include <optional>
#include <string>

#include "model/agent_context.h"
#include "support/dictionary.h"

namespace lmx {

class AgentRecord;

/// Refuses to start while the session records (logged, reported). What records is not changed in any way.
/// Main thread. @return the RecordError of the refusal; nothing when the session is idle
std::optional<int> LXAgentRecordRefusal(AgentRecord& session);

/// Prepares and starts a recording with `metadata`. Main thread. @return a RecordError
int LXAgentRecordPrepareCapture(AgentContext& context, SharedDictionary metadata);
/// The same for the movie `path`; fails without a session or a path. With a session the caller holds the
/// control-action mutex.
int LXAgentRecordPrepareCaptureSync(AgentContext& context, const std::optional<std::string>& path,
                                    SharedDictionary metadata);

}  // namespace lmx
