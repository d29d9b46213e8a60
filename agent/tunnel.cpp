// Life of the server tunnel.
#include "agent/agent_main.h"
#include "platform/log.h"

namespace lmx {

using namespace std::chrono_literals;

bool AgentMain::openTunnel() {
  agentControl_ = newControlChannel<AgentControl>(context_, this);
  return agentControl_ != nullptr;
}

void AgentMain::closeTunnel() {
  if (!agentControl_) return;
  // Its thread may be waiting for this one: the loop goes on until it has ended.
  agentControl_->askToStop();
  while (!agentControl_->threadHasEnded()) loop_.run(20ms);
  agentControl_ = nullptr;
}

void AgentMain::tellServerOfTheEnd() {
  if (!agentControl_ || agentControl_->server_protocol_version() < 2 || !agentControl_->connected()) return;
  closeTunnel();
  LMPLogMessage(context_->log_context(), kLogInfo, "Notifying the server that the agent is going offline");
  const auto deadline = std::chrono::steady_clock::now() + 10s;
  context_->setAgent_sent_or_fail(false);
  if (!openTunnel()) return;
  while (!context_->agent_sent_or_fail() && std::chrono::steady_clock::now() < deadline) loop_.run(100ms);
  closeTunnel();
}

void AgentMain::watchNetwork() {
  if (network_.open() != 0) {
    LMPLogMessage(context_->log_context(), kLogError,
                  "Unable to create dynamic store for Netvane registration for Network Notification");
    LMPLogMessage(context_->log_context(), kLogError, "Unable to register for network notifications");
    return;
  }
  networkSource_ = loop_.watchReadable(network_.descriptor(), [this] {
    if (network_.takeChanges() && agentControl_) agentControl_->networkChanged();
  });
}

}  // namespace lmx
