// The server tunnel: we connect, say who we are in clear, then every line is encrypted.
#pragma once
#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "control/channel/agent_control_base.h"
#include "control/tunnel/message_cipher.h"

namespace lmx {

class AgentControl final : public AgentControlBase {
 public:
  AgentControl(std::shared_ptr<AgentContext> context, AgentActions* actions,
               ChannelClock& clock = systemChannelClock());
  ~AgentControl() override;

 protected:
  int connect() override;
  std::optional<std::string> commandFromReceivedData(const std::string& line) override;
  bool deliver(const std::string& reply) override;
  void logNobodyToReplyTo(const std::string& reply) const override;

 private:
  /// Announces the agent on the connection. @return 0; 24 when it could not be sent, 1 without a context.
  int sendAGENT();
  [[nodiscard]] bool wasDroppedAtOnce() const;
  void watchPeer();
  void logPeer(const ServerSettings& server);
  void serverRejected();

  const CipherBlock initialization_vector_;
  /// When the last connection was made. Channel thread only.
  std::optional<std::chrono::steady_clock::time_point> connected_at_;
};

}  // namespace lmx
