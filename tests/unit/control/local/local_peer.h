// A local tool, as the tests of the local socket play it.
#pragma once
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <array>
#include <chrono>
#include <string>
#include <string_view>
#include <thread>
#include <utility>

#include "platform/paths.h"
#include "support/unique_fd.h"

namespace lmx::testing {

inline std::string socketPath() { return systemPath(kLocalSocket); }

/// A local tool.
class LocalPeer {
 public:
  /// Connects, waiting for the listener.
  LocalPeer() {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    socketPath().copy(address.sun_path, sizeof address.sun_path - 1);
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    do {
      socket_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
      connected_ = ::connect(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
      if (!connected_) std::this_thread::yield();
    } while (!connected_ && std::chrono::steady_clock::now() < deadline);
    EXPECT_TRUE(connected_);
  }
  void send(std::string_view text) {
    while (!text.empty()) {
      const ssize_t sent = ::send(socket_.get(), text.data(), text.size(), MSG_NOSIGNAL);
      ASSERT_GT(sent, 0);
      text.remove_prefix(static_cast<std::size_t>(sent));
    }
  }
  /// Reads until what has come ends with `end`; what came, complete or not, after half a minute.
  std::string receiveUpTo(const std::string& end) {
    while (!received_.ends_with(end)) {
      if (!receiveSome(std::chrono::seconds(30))) break;
    }
    return std::exchange(received_, {});
  }
  /// Whether the channel closes the connection.
  bool isClosed() {
    while (receiveSome(std::chrono::seconds(30))) {
    }
    return closed_;
  }
  bool hasReply(std::chrono::milliseconds limit) { return receiveSome(limit); }
  /// Whether the channel has read all that was sent.
  [[nodiscard]] bool isRead() const {
    int unread = 0;
    EXPECT_EQ(::ioctl(socket_.get(), TIOCOUTQ, &unread), 0);
    return unread == 0;
  }
  void close() { socket_.reset(); }
  /// Closes so that the other side finds data and the end at once.
  void closeAbruptly() {
    const linger now{1, 0};
    ::setsockopt(socket_.get(), SOL_SOCKET, SO_LINGER, &now, sizeof now);
    socket_.reset();
  }

 private:
  bool receiveSome(std::chrono::milliseconds limit) {
    pollfd waited{socket_.get(), POLLIN, 0};
    if (::poll(&waited, 1, static_cast<int>(limit.count())) != 1) return false;
    std::array<char, 4096> buffer{};
    const ssize_t length = ::recv(socket_.get(), buffer.data(), buffer.size(), 0);
    closed_ = length <= 0;
    if (!closed_) received_.append(buffer.data(), static_cast<std::size_t>(length));
    return !closed_;
  }
  UniqueFd socket_;
  std::string received_;
  bool connected_ = false;
  bool closed_ = false;
};

}  // namespace lmx::testing
