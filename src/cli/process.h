// Sets up and runs the agent process.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"

namespace lmx {

/// Creates the agent, reads the command line, runs the agent and announces its stop. @return the exit status.
/// The agent is not destroyed, because threads that are never joined may still use it: exit without running
/// destructors.
int runAgentProcess(int argc, char** argv, std::shared_ptr<CaptureFramework> framework);

}  // namespace lmx
