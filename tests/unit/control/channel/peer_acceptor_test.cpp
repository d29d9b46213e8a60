// How a listening channel gets its next peer.
#include "control/channel/peer_acceptor.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>

#include "record/agent_record.h"
#include "support/unique_fd.h"
#include "tests/unit/doubles/log_capture.h"

namespace lmx {
namespace {

class Accepting : public ::testing::Test {
 protected:
  static int keepAliveOf(int socket) {
    int on = -1;
    socklen_t size = sizeof on;
    return ::getsockopt(socket, SOL_SOCKET, SO_KEEPALIVE, &on, &size) == 0 ? on : -1;
  }
  [[nodiscard]] std::string lineFor(int peer) const {
    return "accepted connection fd = " + std::to_string(peer) +
           " from listen fd = " + std::to_string(listening_.get());
  }
  testing::LogCapture log_;
  UniqueFd listening_{::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)};
  ChannelContext context_{newAgentContext()};
  PeerSockets sockets_;
  LineAssembler line_;
  PeerAcceptor acceptor_{{context_, sockets_, line_, systemChannelClock(), -1}, std::chrono::seconds(10)};
};

TEST_F(Accepting, KeepAliveIsSetOnTheListeningSocketNotOnThePeers) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;  // with no path: the system picks a name
  socklen_t size = sizeof address.sun_family;
  ASSERT_EQ(::bind(listening_.get(), reinterpret_cast<const sockaddr*>(&address), size), 0);
  ASSERT_EQ(::listen(listening_.get(), 1), 0);
  size = sizeof address;
  ASSERT_EQ(::getsockname(listening_.get(), reinterpret_cast<sockaddr*>(&address), &size), 0);
  const UniqueFd peer(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  ASSERT_EQ(::connect(peer.get(), reinterpret_cast<const sockaddr*>(&address), size), 0);
  acceptor_.listenOn(listening_.get());
  EXPECT_EQ(acceptor_.acceptPeer(), 0);
  EXPECT_GE(sockets_.current(), 0);
  EXPECT_TRUE(log_.contains(kLogInfo, lineFor(sockets_.current())));
  EXPECT_EQ(keepAliveOf(listening_.get()), 1);
  EXPECT_EQ(keepAliveOf(sockets_.current()), 0);
}

TEST_F(Accepting, AFailureIsLoggedWithMinusOneAndTriedAgainAtOnce) {
  const auto before = std::chrono::steady_clock::now();
  acceptor_.listenOn(listening_.get());
  EXPECT_EQ(acceptor_.acceptPeer(), -1);  // nobody has called listen
  EXPECT_LT(std::chrono::steady_clock::now() - before, std::chrono::seconds(1));
  EXPECT_EQ(sockets_.current(), -1);
  EXPECT_TRUE(log_.contains(kLogInfo, lineFor(-1)));
}

}  // namespace
}  // namespace lmx
