// The local control socket: commands of local tools, in plain text, from one peer at a time.
#pragma once
#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "control/channel/agent_control_base.h"
#include "control/channel/peer_acceptor.h"
#include "support/shared_value.h"
#include "support/unique_fd.h"

namespace lmx {

/// How long nobody on the local socket has said anything when a peer that waits is taken on all the same.
inline constexpr std::chrono::seconds kSilenceBeforeTheNext{10};

/// Listens on "/var/run/lmxagentd.comm". Peers queue up until the one before them has closed, or says nothing
/// for long. A listener that can't be set up leaves the channel in place without a thread to serve it.
class AgentControlUnix final : public AgentControlBase {
 public:
  AgentControlUnix(std::shared_ptr<AgentContext> context, AgentActions* actions,
                   ChannelClock& clock = systemChannelClock())
      : AgentControlBase(ChannelKind::local, std::move(context), actions, clock) {}
  /// Removes the socket file and runs stop.
  ~AgentControlUnix() override;

  /// Removes the socket file, when this channel made one. Thread-safe.
  void cleanup();

 protected:
  int run() override;
  int connect() override { return localAccept(); }
  PeerAcceptor* peerAcceptor() override { return &acceptor_; }
  std::optional<std::string> commandFromReceivedData(const std::string& line) override;
  bool deliver(const std::string& reply) override;

 private:
  int localConnect();
  int localAccept() { return acceptor_.acceptPeer(); }

  PeerAcceptor acceptor_{{context(), sockets(), partialCommand(), clock(), wakeDescriptor()},
                         kSilenceBeforeTheNext};
  UniqueFd localDomainSocket_;            // channel thread only
  SharedValue<std::string> socket_path_;  // empty while no file of ours is there
};

}  // namespace lmx
