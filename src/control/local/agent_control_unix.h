// The local control socket: commands of local tools, in plain text, from one peer at a time.
#pragma once
#include <memory>
#include <optional>
#include <string>

#include "control/channel/agent_control_base.h"

namespace lmx {

/// Listens on "/var/run/lmxagentd.comm". Peers queue up until the one before them has closed. A listener that
/// can't be set up leaves the channel in place without a thread to serve it.
class AgentControlUnix final : public AgentControlBase {
 public:
  using AgentControlBase::AgentControlBase;
  /// Removes the socket file and runs stop.
  ~AgentControlUnix() override;

  /// Removes the socket file, when this channel made one. Thread-safe.
  void cleanup();

  [[nodiscard]] bool requiresAuthentication() const override { return false; }
  void setAuthenticated(bool) override {}
  [[nodiscard]] ChannelKind kind() const override { return ChannelKind::local; }

 protected:
  int run() override;
  int connect() override { return localAccept(); }
  std::optional<std::string> commandFromReceivedData(const std::string& line) override;
  void sendReply(const std::string& reply) override;

 private:
  int localConnect();
  int localAccept() { return acceptPeer(localDomainSocket_.get()); }

  UniqueFd localDomainSocket_;            // channel thread only
  SharedValue<std::string> socket_path_;  // empty while no file of ours is there
};

}  // namespace lmx
