// The directory that recordings are written to.
#pragma once
#include <string>

#include "model/agent_log.h"

namespace lmx {

/// Creates the directory `path` if it is missing. @return whether it exists afterwards (logged if not)
bool setupRecordingRepository(const AgentLog& log, const std::string& path);

}  // namespace lmx
