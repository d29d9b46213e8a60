// A channel without a transport.
#pragma once
#include <atomic>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "control/channel/agent_control_base.h"
#include "record/agent_record.h"
#include "support/unique_fd.h"
#include "tests/unit/doubles/journal.h"

namespace lmx::testing {

/// Takes lines as they are and collects replies; without a thread of its own it answers at once. Connections
/// come from `on_connect`, set before the thread starts.
class ScriptedChannel final : public AgentControlBase {
 public:
  ScriptedChannel(std::shared_ptr<AgentContext> context, AgentActions* actions, ChannelClock& clock)
      : AgentControlBase(ChannelKind::detached, std::move(context), actions, clock) {}
  ~ScriptedChannel() override { stop(); }

  bool requires_authentication = false;
  bool readable_lines = true;
  std::atomic<bool> takes_replies{true};
  std::function<int(ScriptedChannel&)> on_connect;
  std::function<void(ScriptedChannel&)> on_reply;

  void receive(std::string_view chunk) {
    packetReceived(chunk.data(), static_cast<std::uint32_t>(chunk.size()));
  }
  [[nodiscard]] std::vector<std::string> replies() const { return replies_.entries(); }
  void useSocket(int socket) { sockets().setCurrent(UniqueFd(socket)); }
  using AgentControlBase::disconnect;
  using AgentControlBase::disconnectOld;
  void sendReply(const std::string& reply) override {
    if (!running()) return static_cast<void>(deliver(reply));
    AgentControlBase::sendReply(reply);
  }

 protected:
  [[nodiscard]] bool requiresAuthentication() const override { return requires_authentication; }
  int connect() override { return on_connect ? on_connect(*this) : -1; }
  std::optional<std::string> commandFromReceivedData(const std::string& line) override {
    if (!readable_lines) return std::nullopt;
    return line;
  }
  bool deliver(const std::string& reply) override {
    replies_.add(reply);
    if (on_reply) on_reply(*this);
    return takes_replies;
  }

 private:
  Journal replies_;
};

}  // namespace lmx::testing
