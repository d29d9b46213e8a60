// What the ad-hoc client asks of the daemon. Pure.
#pragma once
#include <string>

#include "model/agent_context.h"
#include "model/codes.h"

namespace lmx {

/// The command line for the context's request, with its line feed. Values are put in as they are.
std::string adHocCommand(const AgentContext& context);

}  // namespace lmx
