// Sets up the capture framework's controller for a recording.
#pragma once
#include "model/agent_context.h"

namespace lmx {

/// Makes a controller with its delegate for the context's session and has it prepare. Main thread.
/// @return 0, or 3 when the capture framework refuses
int LXAgentRecordPrepareCaptureController(AgentContext& context);

}  // namespace lmx
