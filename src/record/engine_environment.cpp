// Holds the engine's environment, which is reached only through here.
#include "record/engine_environment.h"

#include <utility>

#include "model/codes.h"
#include "platform/log.h"
#include "support/shared_value.h"

namespace lmx {
namespace {

SharedValue<EngineEnvironment>& environmentSlot() {
  // Never destroyed: threads that outlive main use it.
  static SharedValue<EngineEnvironment>& slot = *std::make_unique<SharedValue<EngineEnvironment>>().release();
  return slot;
}

}  // namespace

void setEngineEnvironment(EngineEnvironment environment) { environmentSlot().set(std::move(environment)); }
EngineEnvironment engineEnvironment() { return environmentSlot().get(); }

void reportRuntimeError(int code) {
  if (AgentActions* actions = engineEnvironment().actions) actions->recordRuntimeErrorCallback(code);
}

int invalidArguments(const char* function) {
  LMPLogMessage(nullptr, kLogError, "Invalid Arguments in function %s", function);
  return kRecordInvalidArguments;
}

}  // namespace lmx
