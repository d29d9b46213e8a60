// Connecting to the first reachable of several hosts, on the loopback.
#include "platform/net/connect_multiple.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>

#include <cerrno>
#include <chrono>

#include "support/unique_fd.h"

namespace lmx {
namespace {

/// A listening port on the loopback.
class Listener {
 public:
  explicit Listener(int family = AF_INET, int backlog = 8)
      : fd_(socket(family, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_in v4{};
    v4.sin_family = AF_INET;
    v4.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    sockaddr_in6 v6{};
    v6.sin6_family = AF_INET6;
    v6.sin6_addr = in6addr_loopback;
    const auto* address =
        family == AF_INET ? reinterpret_cast<sockaddr*>(&v4) : reinterpret_cast<sockaddr*>(&v6);
    const socklen_t size = family == AF_INET ? sizeof v4 : sizeof v6;
    ready_ = bind(fd_.get(), address, size) == 0 && listen(fd_.get(), backlog) == 0;
  }

  [[nodiscard]] bool ready() const { return ready_; }
  [[nodiscard]] std::string port() const {
    sockaddr_in6 address{};  // sockaddr_in has the port at the same offset
    socklen_t size = sizeof address;
    getsockname(fd_.get(), reinterpret_cast<sockaddr*>(&address), &size);
    return std::to_string(ntohs(address.sin6_port));
  }
  [[nodiscard]] bool accepts() const {
    return UniqueFd(accept4(fd_.get(), nullptr, nullptr, SOCK_CLOEXEC)).valid();
  }

 private:
  UniqueFd fd_;
  bool ready_ = false;
};

/// A port on which nobody listens: it was free a moment ago.
std::string deadPort() { return Listener().port(); }

struct Attempt {
  Attempt(const std::vector<std::string>& hosts, const std::string& port) {
    int fd = 12345;
    result = lmp_connect_multiple(hosts, port, &fd);
    connected = fd >= 0;
    socket.reset(fd);
  }
  int result;
  bool connected;
  UniqueFd socket;
};

TEST(ConnectMultiple, EmptyListFails) {
  const Attempt attempt({}, "80");
  EXPECT_EQ(attempt.result, -1);
  EXPECT_FALSE(attempt.connected);
}

TEST(ConnectMultiple, ConnectsToAHost) {
  const Listener listener;
  const Attempt attempt({"127.0.0.1"}, listener.port());
  EXPECT_EQ(attempt.result, 0);
  EXPECT_TRUE(attempt.connected);
  EXPECT_TRUE(listener.accepts());
}

TEST(ConnectMultiple, ResolvesNames) {
  const Listener listener;
  const Attempt attempt({"localhost"}, listener.port());
  EXPECT_EQ(attempt.result, 0);
  EXPECT_TRUE(listener.accepts());
}

TEST(ConnectMultiple, SocketBlocksAndIsClosedInChildren) {
  const Listener listener;
  const Attempt attempt({"127.0.0.1"}, listener.port());
  EXPECT_EQ(fcntl(attempt.socket.get(), F_GETFL) & O_NONBLOCK, 0);
  EXPECT_EQ(fcntl(attempt.socket.get(), F_GETFD) & FD_CLOEXEC, FD_CLOEXEC);
}

TEST(ConnectMultiple, UnreachableHostIsSkipped) {
  const Listener listener;
  const Attempt attempt({"127.0.0.1:" + deadPort(), "no.such.host.invalid", "127.0.0.1"}, listener.port());
  EXPECT_EQ(attempt.result, 0);
  EXPECT_TRUE(listener.accepts());
}

TEST(ConnectMultiple, FirstReachableHostWins) {
  const Listener first;
  const Listener second;
  const Attempt attempt({"127.0.0.1:" + first.port(), "127.0.0.1:" + second.port()}, deadPort());
  EXPECT_EQ(attempt.result, 0);
  EXPECT_TRUE(first.accepts());
}

TEST(ConnectMultiple, NoHostReachableFails) {
  const Attempt attempt({"127.0.0.1"}, deadPort());
  EXPECT_EQ(attempt.result, -1);
  EXPECT_FALSE(attempt.connected);
}

TEST(ConnectMultiple, PortOfAnEntryWins) {
  const Listener listener;
  const Attempt attempt({"127.0.0.1:" + listener.port()}, deadPort());
  EXPECT_EQ(attempt.result, 0);
}

TEST(ConnectMultiple, IPv6AddressesAreAcceptedWithAndWithoutBrackets) {
  const Listener listener(AF_INET6);
  if (!listener.ready()) GTEST_SKIP() << "no IPv6 loopback here";
  EXPECT_EQ(Attempt({"[::1]:" + listener.port()}, deadPort()).result, 0);
  EXPECT_EQ(Attempt({"[::1]"}, listener.port()).result, 0);
  EXPECT_EQ(Attempt({"::1"}, listener.port()).result, 0);
}

TEST(ConnectMultiple, MalformedEntriesAreSkipped) {
  const Listener listener;
  const std::string port = listener.port();
  for (const std::string& entry :
       {std::string(), std::string(":") + port, std::string("127.0.0.1:"), std::string("127.0.0.1:http"),
        "127.0.0.1: " + port, "127.0.0.1:+" + port, std::string("127.0.0.1:0"),
        std::string("127.0.0.1:65536"), "127.0.0.1:" + port + "x", std::string("127.0.0.1:000000"),
        "[127.0.0.1:" + port, "[127.0.0.1]x" + port, "[]:" + port}) {
    EXPECT_EQ(Attempt({entry}, port).result, -1) << entry;
  }
}

TEST(ConnectMultiple, PortIsDecimalText) {
  for (const char* port : {"", "-1", "0", "65536", "0x50", "80 ", "http"}) {
    EXPECT_EQ(Attempt({"127.0.0.1"}, port).result, -1) << port;
  }
}

TEST(ConnectMultiple, UnresponsiveHostTimesOut) {
  // With a full backlog further connections are dropped and never answered.
  const Listener listener(AF_INET, 0);
  std::vector<UniqueFd> fill;
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  address.sin_port = htons(static_cast<std::uint16_t>(std::stoi(listener.port())));
  for (int i = 0; i < 4; ++i) {
    fill.emplace_back(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    (void)connect(fill.back().get(), reinterpret_cast<sockaddr*>(&address), sizeof address);
  }
  const auto begin = std::chrono::steady_clock::now();
  const Attempt attempt({"127.0.0.1"}, listener.port());
  const auto taken = std::chrono::steady_clock::now() - begin;
  EXPECT_EQ(attempt.result, -1);
  EXPECT_GE(taken, std::chrono::seconds(9));
  EXPECT_LT(taken, std::chrono::seconds(15));
}

}  // namespace
}  // namespace lmx
