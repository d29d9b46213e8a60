// The PID file.
#pragma once
#include "model/agent_log.h"

namespace lmx {

/// @return 0, or 1 when the file can't be created (permission denied is only logged)
int createPIDFile(const AgentLog& log);
void removePIDFile();

}  // namespace lmx
