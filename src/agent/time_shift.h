// The time shift, which operators set in a file.
#pragma once
#include "model/agent_state.h"

namespace lmx {

/// Reads the time-shift file into the state; 0 without a usable file.
void readTimeShift(AgentState& state);

}  // namespace lmx
