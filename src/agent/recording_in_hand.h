// Whether the agent is recording, for decisions that must not end a recording.
#pragma once
#include "model/agent_context.h"

namespace lmx {

/// Whether a recording runs, or has been stopped while its capture is still closing the movie. What follows,
/// up to the submission, is Submission::isIdle(). Thread-safe.
bool recordingInHand(const AgentContext& context);

}  // namespace lmx
