// The agent's control channels.
#pragma once
#include <memory>

#include "agent/tunnel_keeper.h"
#include "control/channel/detached_channel.h"
#include "control/local/agent_control_unix.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "platform/run_loop.h"

namespace lmx {

/// Main thread only.
class Channels {
 public:
  /// @param actions, loop  outlive the object
  Channels(const std::shared_ptr<AgentContext>& context, AgentActions& actions, RunLoop& loop)
      : context_(context), actions_(actions), tunnel_(context, actions, loop), detached_(context, &actions) {}

  [[nodiscard]] TunnelKeeper& tunnel() { return tunnel_; }
  /// Ends all channels. Joins their threads: call it only when none of them can be waiting for the loop.
  void close();
  /// @return false when the local channel can't be started
  bool openLocal();
  /// The channel of that kind, or the one without a peer when there is none.
  [[nodiscard]] AgentControlBase& channelOf(ChannelKind kind);

 private:
  const std::shared_ptr<AgentContext> context_;
  AgentActions& actions_;
  TunnelKeeper tunnel_;
  std::unique_ptr<AgentControlUnix> agentControlLocal_;
  DetachedChannel detached_;
};

}  // namespace lmx
