// Sets up the capture framework's controller for a recording.
#pragma once
#include "model/agent_context.h"

namespace lmx {

/// Creates a controller and its delegate for the context's session and prepares the capture. Main thread.
/// @return 0, or 3 when the capture framework refuses
int LXAgentRecordPrepareCaptureController(AgentContext& context);

}  // namespace lmx
