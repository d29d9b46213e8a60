// The objects that the recording engine works with.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "model/codes.h"

namespace lmx {

/// Set at start-up before any thread starts; used by the engine's free functions. In tests any of them may be
/// absent.
struct EngineEnvironment {
  std::shared_ptr<AgentContext> context;
  AgentActions* actions = nullptr;  ///< lives until the process ends
  std::shared_ptr<CaptureFramework> framework;
};
void setEngineEnvironment(EngineEnvironment environment);
EngineEnvironment engineEnvironment();

/// Reports an engine error, a RecordError, to the agent.
void reportRuntimeError(int code);

/// Logs that `function` was called with invalid arguments. @return kRecordInvalidArguments
int invalidArguments(const char* function);

}  // namespace lmx
