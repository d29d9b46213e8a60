// The agent's context as one channel holds it.
#include "control/handlers/channel_context.h"

namespace lmx {

std::shared_ptr<AgentRecord> ChannelContext::session() const {
  const auto context = get();
  return context ? context->record_context() : nullptr;
}

LMPLogContext ChannelContext::log() const {
  const auto context = get();
  return context ? context->log_context() : nullptr;
}

void ChannelContext::logDebug(const std::string& message) const {
  if (const auto context = get()) context->logDebug(message);
}

void ChannelContext::logInfo(const std::string& message) const {
  if (const auto context = get()) context->logInfo(message);
}

}  // namespace lmx
