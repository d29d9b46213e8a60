// The process around the agent.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"

namespace lmx {

/// Makes the agent, reads the command line, runs it and says goodbye. @return the exit status. The agent is
/// not destroyed: threads that nobody joins may still reach it, so end the process without destructors.
int runAgentProcess(int argc, char** argv, std::shared_ptr<CaptureFramework> framework);

}  // namespace lmx
