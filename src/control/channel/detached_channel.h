// A channel without any peer: it runs commands whose own channel is gone.
#pragma once
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "control/channel/agent_control_base.h"

namespace lmx {

/// Never started. Replies are logged at debug level and go nowhere.
class DetachedChannel final : public AgentControlBase {
 public:
  DetachedChannel(std::shared_ptr<AgentContext> context, AgentActions* actions)
      : AgentControlBase(ChannelKind::detached, std::move(context), actions, systemChannelClock()) {}
  ~DetachedChannel() override { stop(); }

 protected:
  int connect() override { return 1; }
  std::optional<std::string> commandFromReceivedData(const std::string&) override { return std::nullopt; }
  bool deliver(const std::string&) override { return false; }
};

}  // namespace lmx
