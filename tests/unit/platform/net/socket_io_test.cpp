// Sending and waiting on real sockets.
#include "platform/net/socket_io.h"

#include <gtest/gtest.h>
#include <sys/eventfd.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <thread>

#include "support/unique_fd.h"
#include "tests/unit/doubles/wait_until.h"

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

/// How much of a long text the system keeps for a peer that doesn't read.
std::size_t bufferedBytes(int socket) {
  const std::string text(4U << 20, 'x');
  const ssize_t sent = ::send(socket, text.data(), text.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
  return sent < 0 ? 0 : static_cast<std::size_t>(sent);
}

std::size_t unread(int socket) {
  int bytes = 0;
  EXPECT_EQ(::ioctl(socket, FIONREAD, &bytes), 0);
  return static_cast<std::size_t>(bytes);
}

TEST_F(SocketIo, RoomThatTheSystemDoesNotReportIsUsed) {
  std::array<int, 2> ends{};
  ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
  const UniqueFd sender(ends[0]);
  const UniqueFd receiver(ends[1]);
  const std::size_t fits = bufferedBytes(ours_.get());
  int result = -1;
  std::thread sending([&] { result = sendWhole(sender.get(), std::string(fits * 5 / 4, 'x'), 20s, -1); });
  ASSERT_TRUE(testing::waitUntil([&] { return unread(receiver.get()) == fits; })) << "the buffer is full";
  std::string part(fits / 2,
                   '\0');  // the system would report room when three quarters of the buffer are free
  EXPECT_EQ(::recv(receiver.get(), part.data(), part.size(), MSG_WAITALL), static_cast<ssize_t>(part.size()));
  sending.join();
  EXPECT_EQ(result, 0);
}

TEST_F(SocketIo, PeerThatReadsAFewBytesAtATimeHasTheWholeLimit) {
  std::atomic<bool> ended{false};
  std::thread reader([&] {
    std::array<char, 16> few{};
    while (!ended && ::recv(peer_.get(), few.data(), few.size(), 0) > 0) std::this_thread::sleep_for(10ms);
  });
  const auto before = std::chrono::steady_clock::now();
  EXPECT_EQ(sendWhole(ours_.get(), std::string(4U << 20, 'x'), 1s, -1), ETIMEDOUT);
  EXPECT_GE(std::chrono::steady_clock::now() - before, 1s);
  ended = true;
  reader.join();
}

TEST_F(SocketIo, PeerThatNeverReadsEndsTheLimit) {
  const auto before = std::chrono::steady_clock::now();
  EXPECT_EQ(sendWhole(ours_.get(), std::string(4U << 20, 'x'), 50ms, -1), ETIMEDOUT);
  EXPECT_GE(std::chrono::steady_clock::now() - before, 50ms);
  EXPECT_TRUE(peerIsConnected(ours_.get()));
}

TEST_F(SocketIo, WakeEndsTheLimit) {
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

TEST_F(SocketIo, WaitHearsOthersAndPrefersThem) {
  const UniqueFd first(::eventfd(0, EFD_CLOEXEC));
  const UniqueFd second(::eventfd(1, EFD_CLOEXEC));
  ASSERT_EQ(::write(peer_.get(), "x", 1), 1);
  EXPECT_EQ(awaitReadable(ours_.get(), -1, 30s, std::array{-1, first.get()}), Readiness::readable);
  EXPECT_EQ(awaitReadable(ours_.get(), -1, 30s, std::array{first.get(), second.get()}),
            Readiness::otherReadable);
  EXPECT_TRUE(isReadable(second.get()));
  EXPECT_FALSE(isReadable(first.get()));
}

TEST_F(SocketIo, WaitTellsAWakeAndABadDescriptor) {
  const UniqueFd wake(::eventfd(1, EFD_CLOEXEC));
  EXPECT_EQ(awaitReadable(ours_.get(), wake.get(), 30s), Readiness::woken);
  EXPECT_EQ(awaitReadable(9999, -1, 30s), Readiness::badDescriptor);
}

}  // namespace
}  // namespace lmx
