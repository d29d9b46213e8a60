// The present peer's socket and the previous one's.
#include "control/channel/peer_sockets.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>

#include <array>
#include <atomic>
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
    sockets_.setCurrent(UniqueFd(ends[0]));
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

TEST_F(PeerSocketsTest, AskedByAnotherThreadItNeverLooksAtAClosedDescriptor) {
  std::atomic<bool> done{false};
  std::thread other([&] {
    while (!done) static_cast<void>(sockets_.connected());
  });
  for (int i = 0; i < 2000; ++i) {
    const UniqueFd peer = newPeer();
    sockets_.closeCurrent();
    ASSERT_TRUE(isClosed(peer));
  }
  done = true;
  other.join();
  EXPECT_FALSE(sockets_.connected());
}

TEST_F(PeerSocketsTest, EachConnectionHasItsOwnNumber) {
  EXPECT_EQ(sockets_.replyTarget(), 0U);
  const UniqueFd first = newPeer();
  const auto number = sockets_.replyTarget();
  EXPECT_NE(number, 0U);
  sockets_.retireCurrent();
  EXPECT_EQ(sockets_.replyTarget(), 0U);
  const UniqueFd second = newPeer();
  EXPECT_NE(sockets_.replyTarget(), number);
  sockets_.restorePrevious();
  EXPECT_EQ(sockets_.replyTarget(), number) << "it is still the same connection";
}

TEST_F(PeerSocketsTest, APeerThatMustBeGreetedGetsNoReplyBefore) {
  std::array<int, 2> ends{};
  ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
  const UniqueFd peer(ends[1]);
  sockets_.setCurrent(UniqueFd(ends[0]), Greeting::comesFirst);
  EXPECT_EQ(sockets_.replyTarget(), 0U);
  sockets_.setGreeted();
  EXPECT_NE(sockets_.replyTarget(), 0U);
  sockets_.retireCurrent();
  sockets_.restorePrevious();
  EXPECT_NE(sockets_.replyTarget(), 0U);
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
