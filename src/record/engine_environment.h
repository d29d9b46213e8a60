// What the recording engine works with.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "model/codes.h"

namespace lmx {

/// Set once at start-up before any thread starts, and reached by the engine's plain functions. Any of them
/// may be absent in tests.
struct EngineEnvironment {
  std::shared_ptr<AgentContext> context;
  AgentActions* actions = nullptr;  ///< lives until the process ends
  std::shared_ptr<CaptureFramework> framework;
};
void setEngineEnvironment(EngineEnvironment environment);
EngineEnvironment engineEnvironment();

/// Tells the agent of an error of the engine, a RecordError.
void reportRuntimeError(int code);

/// Logs that `function` was called with arguments that make no sense. @return kRecordInvalidArguments
int invalidArguments(const char* function);

}  // namespace lmx
