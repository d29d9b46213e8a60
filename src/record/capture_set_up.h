// Sets up the capture framework's controller for a recording.
#pragma once
#include "model/agent_context.h"
#include "support/dictionary.h"

namespace lmx {

/// Creates a controller and its delegate for the context's session and prepares the capture. Main thread.
/// @param metadata  of the START that asks for it; null: none
/// @return 0, or 3 when the capture framework refuses
int LXAgentRecordPrepareCaptureController(AgentContext& context, const SharedDictionary& metadata);

}  // namespace lmx
