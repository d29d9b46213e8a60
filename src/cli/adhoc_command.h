// What the ad-hoc client asks of the daemon. Pure.
#pragma once
#include <string>

#include "model/agent_context.h"

namespace lmx {

/// The values of AgentContext::adhoc_request_type; any other counts as a recording.
enum AdHocRequest : int {
  kAdHocRecording = 0,
  kAdHocStatus = 1,
  kAdHocTimerList = 2,
  kAdHocTimerRevoke = 3,
};

/// The command line for the context's request, with its line feed. Values are put in as they are.
std::string adHocCommand(const AgentContext& context);

}  // namespace lmx
