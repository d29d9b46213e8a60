// Manages the lifetime of the server tunnel.
#pragma once
#include <memory>

#include "control/tunnel/agent_control.h"
#include "model/agent_actions.h"
#include "model/agent_context.h"
#include "platform/run_loop.h"

namespace lmx {

/// Main thread only.
class TunnelKeeper {
 public:
  /// @param actions, loop  outlive the object
  TunnelKeeper(std::shared_ptr<AgentContext> context, AgentActions& actions, RunLoop& loop)
      : context_(std::move(context)), actions_(actions), loop_(loop) {}

  /// The tunnel; null while it is closed.
  [[nodiscard]] AgentControl* tunnel() const { return agentControl_.get(); }
  /// Does nothing while the tunnel is open. @return false when it can't be started (logged)
  bool openTunnel();
  /// Ends the tunnel. Keeps running the loop, since the tunnel's thread may be waiting for this one. A thread
  /// that has not ended after ten seconds is abandoned.
  void closeTunnel();
  /// Ends the tunnel without running the loop: call it only when its thread can't be waiting for the loop.
  void drop() { agentControl_ = nullptr; }
  /// Sends a last hello that says offline, to a server that supports it. Takes at most ten seconds.
  void tellServerOfTheEnd();

 private:
  const std::shared_ptr<AgentContext> context_;
  AgentActions& actions_;
  RunLoop& loop_;
  std::unique_ptr<AgentControl> agentControl_;  ///< null while the camera is missing
};

}  // namespace lmx
