// The present peer's socket and the previous one's.
#include "control/channel/peer_sockets.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>

#include <array>
#include <thread>

#include "support/unique_fd.h"

namespace lmx {
namespace {

class PeerSocketsTest : public ::testing::Test {
 protected:
  /// A new present peer. @return its end
  UniqueFd newPeer() {
    std::array<int, 2> ends{};
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
    sockets_.setCurrent(ends[0]);
    return UniqueFd(ends[1]);
  }
  /// Whether our end is closed.
  static bool isClosed(const UniqueFd& peer) {
    pollfd asked{peer.get(), POLLIN, 0};
    return ::poll(&asked, 1, 0) == 1 && (asked.revents & POLLHUP) != 0;
  }
  PeerSockets sockets_;
};

TEST_F(PeerSocketsTest, NobodyIsThereAtFirst) {
  EXPECT_EQ(sockets_.current(), -1);
  EXPECT_EQ(sockets_.previousIfAlive(), -1);
  EXPECT_FALSE(sockets_.connected());
  EXPECT_FALSE(sockets_.previousSpeaks());
}

TEST_F(PeerSocketsTest, PeerThatClosedItsSideIsNotConnected) {
  const UniqueFd peer = newPeer();
  EXPECT_TRUE(sockets_.connected());
  ::shutdown(peer.get(), SHUT_WR);
  EXPECT_FALSE(sockets_.connected());
}

TEST_F(PeerSocketsTest, ClosingFromTwoThreadsClosesOnce) {
  const UniqueFd peer = newPeer();
  std::thread other([&] { sockets_.closeCurrent(); });
  sockets_.closeCurrent();
  other.join();
  EXPECT_TRUE(isClosed(peer));
  EXPECT_EQ(sockets_.current(), -1);
}

TEST_F(PeerSocketsTest, ThePreviousPeerStaysUntilItIsClosed) {
  const UniqueFd old = newPeer();
  sockets_.retireCurrent();
  const UniqueFd peer = newPeer();
  EXPECT_FALSE(isClosed(old));
  sockets_.closePrevious();
  EXPECT_TRUE(isClosed(old));
  EXPECT_TRUE(sockets_.connected());
}

TEST_F(PeerSocketsTest, ThePreviousPeerIsHeardAndRestored) {
  const UniqueFd old = newPeer();
  sockets_.retireCurrent();
  EXPECT_FALSE(sockets_.previousSpeaks());
  ASSERT_EQ(::send(old.get(), "x", 1, MSG_NOSIGNAL), 1);
  EXPECT_TRUE(sockets_.previousSpeaks());
  EXPECT_EQ(sockets_.previousIfAlive(), sockets_.previous());
  sockets_.restorePrevious();
  EXPECT_TRUE(sockets_.connected());
  EXPECT_EQ(sockets_.previous(), -1);
}

TEST_F(PeerSocketsTest, APreviousPeerThatHasGoneIsNotAlive) {
  { const UniqueFd gone = newPeer(); }
  sockets_.retireCurrent();
  EXPECT_EQ(sockets_.previousIfAlive(), -1);
  EXPECT_FALSE(sockets_.previousSpeaks());
}

}  // namespace
}  // namespace lmx
