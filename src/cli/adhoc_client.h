// Ad-hoc mode: has the running daemon do one thing, and for a recording stays until it is interrupted.
#pragma once
#include "agent/agent_main.h"
#include "control/local/client_connect.h"

namespace lmx {

/// Main thread.
class AdHocClient {
 public:
  /// @param agent  outlives the object; its loop and its signals are used
  explicit AdHocClient(AgentMain& agent) : agent_(agent), context_(*agent.agentContext()) {}

  /// Sends one command to the running daemon; a recording lasts until an interrupt. @return the exit status
  int startupAdHoc();

 private:
  int recordAdHoc();
  /// Until the process is told to end or a capture of its own loses its device.
  void appLoopAdHoc();
  /// Acts on the signals that have come. @return whether the process is to go on
  bool handleSignals();

  AgentMain& agent_;
  AgentContext& context_;
  ClientConnect client_;
};

}  // namespace lmx
