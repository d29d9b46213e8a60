// The directory that recordings are written to.
#pragma once
#include <string>

#include "model/agent_log.h"

namespace lmx {

/// Makes the directory `path` when it is missing. @return whether it exists afterwards (else logged)
bool setupRecordingRepository(const AgentLog& log, const std::string& path);

}  // namespace lmx
