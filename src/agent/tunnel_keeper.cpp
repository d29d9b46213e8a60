// Opens and closes the tunnel.
#include "agent/tunnel_keeper.h"

#include <chrono>
#include <utility>

#include "platform/log.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kThreadPatience = 10s;

}  // namespace

bool TunnelKeeper::openTunnel() {
  if (agentControl_) return true;
  agentControl_ = newControlChannel<AgentControl>(context_, &actions_);
  return agentControl_ != nullptr;
}

void TunnelKeeper::closeTunnel() {
  // Taken out first: the turns below may deliver another signal and call this function again.
  auto closing = std::exchange(agentControl_, nullptr);
  if (!closing) return;
  // The tunnel's thread may be waiting for this one, so the loop keeps running until it has ended.
  closing->askToStop();
  const auto deadline = std::chrono::steady_clock::now() + kThreadPatience;
  while (!closing->threadHasEnded() && std::chrono::steady_clock::now() < deadline) loop_.run(20ms);
  if (closing->threadHasEnded()) return;
  LMPLogMessage(
      context_->log_context(), kLogError,
      "The tunnel's thread has not ended within %d seconds (a file system that does not answer?); it is "
      "left behind",
      static_cast<int>(kThreadPatience / 1s));
  // The thread still uses the channel when it wakes up, so the channel is leaked.
  [[maybe_unused]] const AgentControl* left_behind = closing.release();
}

void TunnelKeeper::tellServerOfTheEnd() {
  if (!agentControl_ || agentControl_->server_protocol_version() < 2 || !agentControl_->connected()) return;
  closeTunnel();
  LMPLogMessage(context_->log_context(), kLogInfo, "Notifying the server that the agent is going offline");
  const auto deadline = std::chrono::steady_clock::now() + 10s;
  context_->state.agent_sent_or_fail.set(false);
  if (!openTunnel()) return;
  while (!context_->state.agent_sent_or_fail.get() && std::chrono::steady_clock::now() < deadline)
    loop_.run(100ms);
  closeTunnel();
}

}  // namespace lmx
