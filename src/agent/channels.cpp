// Opens the control channels and finds them by kind.
#include "agent/channels.h"

namespace lmx {

void Channels::close() {
  tunnel_.drop();
  agentControlLocal_ = nullptr;
}

bool Channels::openLocal() {
  agentControlLocal_ = newControlChannel<AgentControlUnix>(context_, &actions_);
  return agentControlLocal_ != nullptr;
}

AgentControlBase& Channels::channelOf(ChannelKind kind) {
  if (kind == ChannelKind::tunnel && tunnel_.tunnel() != nullptr) return *tunnel_.tunnel();
  if (kind == ChannelKind::local && agentControlLocal_) return *agentControlLocal_;
  return detached_;
}

}  // namespace lmx
