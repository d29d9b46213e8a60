// A channel without any peer: it runs commands whose own channel is gone.
#pragma once
#include <optional>
#include <string>

#include "control/channel/agent_control_base.h"

namespace lmx {

/// Never started. Replies are logged at debug level and go nowhere.
class DetachedChannel final : public AgentControlBase {
 public:
  using AgentControlBase::AgentControlBase;
  ~DetachedChannel() override { stop(); }

  [[nodiscard]] bool requiresAuthentication() const override { return false; }
  void setAuthenticated(bool) override {}

 protected:
  int connect() override { return 1; }
  std::optional<std::string> commandFromReceivedData(const std::string&) override { return std::nullopt; }
  void sendReply(const std::string& reply) override { logDebug("Nobody to send the reply to: " + reply); }
};

}  // namespace lmx
