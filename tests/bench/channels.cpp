// What a server sees of many agents: memory and threads a channel, and the load while it is away and comes
// back. Usage: bench_channels [CHANNELS [SECONDS-AWAY]]
#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "control/tunnel/agent_control.h"
#include "record/agent_record.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;

void drop(void*, int, const std::string&) {}

/// A field of /proc/self/status, in its own unit (kB for memory).
long statusField(const std::string& name) {
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with(name + ":")) return std::atol(line.c_str() + name.size() + 1);
  }
  return 0;
}

class Listener {
 public:
  void open(std::uint16_t port) {
    socket_.reset(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const int on = 1;
    ::setsockopt(socket_.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    if (::bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
        ::listen(socket_.get(), 4096) != 0) {
      std::perror("listen");
      std::exit(1);
    }
  }
  [[nodiscard]] std::uint16_t port() const {
    sockaddr_in address{};
    socklen_t size = sizeof address;
    ::getsockname(socket_.get(), reinterpret_cast<sockaddr*>(&address), &size);
    return ntohs(address.sin_port);
  }
  /// Dies as a killed server does.
  void kill() {
    socket_.reset();
    peers_.clear();
  }
  /// Takes connections for `time` or until there are `wanted`. @return how many came in each second
  std::map<long, int> take(std::chrono::seconds time, std::size_t wanted) {
    std::map<long, int> arrivals;
    const auto begin = Clock::now();
    while (Clock::now() - begin < time && peers_.size() < wanted) {
      pollfd polled{socket_.get(), POLLIN, 0};
      ::poll(&polled, 1, 100);
      for (;;) {
        UniqueFd peer(::accept4(socket_.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
        if (!peer.valid()) break;
        peers_.push_back(std::move(peer));
        ++arrivals[std::chrono::duration_cast<std::chrono::seconds>(Clock::now() - begin).count()];
      }
    }
    return arrivals;
  }
  [[nodiscard]] std::size_t connected() const { return peers_.size(); }

 private:
  UniqueFd socket_;
  std::vector<UniqueFd> peers_;
};

void run(std::size_t channels, std::chrono::seconds away) {
  Listener server;
  server.open(0);
  const std::uint16_t port = server.port();
  const auto context = newAgentContext();
  context->server.tunnel_host.set("127.0.0.1");
  context->server.tunnel_port.set(std::to_string(port));
  context->server.machine_uuid.set("bench");
  context->server.shared_secret.set(std::array<unsigned char, 16>{});
  context->state.running.set(true);

  const long memory = statusField("VmRSS");
  const long threads = statusField("Threads");
  std::vector<std::unique_ptr<AgentControl>> all;
  for (std::size_t i = 0; i < channels; ++i) all.push_back(newControlChannel<AgentControl>(context, nullptr));
  server.take(std::chrono::seconds(60), channels);
  std::printf("%zu channels connected\n", server.connected());
  std::printf("memory a channel: %.1f kB resident, %.2f threads\n",
              static_cast<double>(statusField("VmRSS") - memory) / static_cast<double>(channels),
              static_cast<double>(statusField("Threads") - threads) / static_cast<double>(channels));

  server.kill();
  std::printf("the server is away for %lld s\n", static_cast<long long>(away.count()));
  std::fflush(stdout);
  const auto wake = Clock::now() + away;
  while (Clock::now() < wake) ::poll(nullptr, 0, 100);
  server.open(port);
  const auto arrivals = server.take(std::chrono::seconds(130), channels);
  std::printf("%zu channels are back; connections in each second since its return:\n", server.connected());
  for (const auto& [second, count] : arrivals) std::printf("  %3ld s  %d\n", second, count);
  for (auto& channel : all) channel->askToStop();
  all.clear();
}

}  // namespace
}  // namespace lmx

int main(int argc, char** argv) {
  const std::size_t channels = argc > 1 ? std::strtoul(argv[1], nullptr, 10) : 1000;
  const long away = argc > 2 ? std::atol(argv[2]) : 30;
  const rlimit files{1 << 16, 1 << 16};
  ::setrlimit(RLIMIT_NOFILE, &files);
  lmx::setLogSinkForTesting(lmx::drop, nullptr);
  lmx::run(std::max<std::size_t>(channels, 1), std::chrono::seconds(away));
  return 0;
}
