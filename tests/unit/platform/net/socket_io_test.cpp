// Sending and waiting on real sockets.
#include "platform/net/socket_io.h"

#include <gtest/gtest.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <thread>

#include "support/unique_fd.h"

namespace lmx {
namespace {

using namespace std::chrono_literals;

class SocketIo : public ::testing::Test {
 protected:
  SocketIo() {
    std::array<int, 2> ends{};
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
    ours_.reset(ends[0]);
    peer_.reset(ends[1]);
  }
  UniqueFd ours_;
  UniqueFd peer_;
};

TEST_F(SocketIo, MoreThanTheBufferArrivesWhole) {
  std::string sent(4U << 20, '\0');
  for (std::size_t i = 0; i < sent.size(); ++i) sent[i] = static_cast<char>('a' + i % 26);
  std::string got;
  std::thread reader([&] {
    std::array<char, 65536> buffer{};
    while (got.size() < sent.size()) {
      const ssize_t length = ::recv(peer_.get(), buffer.data(), buffer.size(), 0);
      if (length <= 0) break;
      got.append(buffer.data(), static_cast<std::size_t>(length));
    }
  });
  EXPECT_EQ(sendWhole(ours_.get(), sent, 20s, -1), 0);
  reader.join();
  EXPECT_EQ(got, sent);
}

TEST_F(SocketIo, PeerThatNeverReadsEndsThePatience) {
  const auto before = std::chrono::steady_clock::now();
  EXPECT_EQ(sendWhole(ours_.get(), std::string(4U << 20, 'x'), 50ms, -1), ETIMEDOUT);
  EXPECT_GE(std::chrono::steady_clock::now() - before, 50ms);
  EXPECT_TRUE(peerIsConnected(ours_.get()));
}

TEST_F(SocketIo, WakeEndsThePatience) {
  const UniqueFd wake(::eventfd(1, EFD_CLOEXEC));
  EXPECT_EQ(sendWhole(ours_.get(), std::string(4U << 20, 'x'), 60s, wake.get()), ECANCELED);
}

TEST_F(SocketIo, PeerThatIsGoneIsAnErrorNotASignal) {
  peer_.reset();
  EXPECT_EQ(sendWhole(ours_.get(), "reply", 1s, -1), EPIPE);
  EXPECT_FALSE(peerIsConnected(ours_.get()));
}

TEST_F(SocketIo, NoSocketIsABadDescriptor) { EXPECT_EQ(sendWhole(-1, "reply", 1s, -1), EBADF); }

TEST_F(SocketIo, WaitTellsDataFromSilence) {
  EXPECT_EQ(awaitReadable(ours_.get(), -1, 0ms), Readiness::timedOut);
  ASSERT_EQ(::write(peer_.get(), "x", 1), 1);
  EXPECT_EQ(awaitReadable(ours_.get(), -1, 30s), Readiness::readable);
}

TEST_F(SocketIo, WaitTellsAWakeAndABadDescriptor) {
  const UniqueFd wake(::eventfd(1, EFD_CLOEXEC));
  EXPECT_EQ(awaitReadable(ours_.get(), wake.get(), 30s), Readiness::woken);
  EXPECT_EQ(awaitReadable(9999, -1, 30s), Readiness::badDescriptor);
}

}  // namespace
}  // namespace lmx
