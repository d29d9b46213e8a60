// Ad-hoc mode: sends the running daemon one command, and during a recording runs until interrupted.
#pragma once
#include "agent/agent_main.h"
#include "control/local/client_connect.h"

namespace lmx {

/// Main thread.
class AdHocClient {
 public:
  /// @param agent  outlives the object, which uses its loop and its signals
  explicit AdHocClient(AgentMain& agent) : agent_(agent), context_(*agent.agentContext()) {}

  /// Sends one command to the running daemon. A recording lasts until an interrupt. @return the exit status
  int startupAdHoc();

 private:
  int recordAdHoc();
  /// Runs until the process is asked to end or a capture of its own loses its device.
  void appLoopAdHoc();
  /// Handles pending signals. @return whether the process should continue
  bool handleSignals();

  AgentMain& agent_;
  AgentContext& context_;
  ClientConnect client_;
};

}  // namespace lmx
