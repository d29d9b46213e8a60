// Resolves and connects host by host, each within its own time limit.
#include "platform/net/connect_multiple.h"

#include <fcntl.h>
#include <netdb.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string_view>
#include <system_error>
#include <thread>

#include "platform/net/socket_io.h"
#include "support/unique_fd.h"

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;
constexpr std::chrono::seconds kTimePerHost{10};

/// What ends a wait: a deadline, or a descriptor that becomes readable.
struct Patience {
  Clock::time_point deadline;
  int wake = -1;
};

struct Endpoint {
  std::string host;
  std::string port;
};

struct AddressListDeleter {
  void operator()(addrinfo* list) const noexcept { freeaddrinfo(list); }
};
using AddressList = std::unique_ptr<addrinfo, AddressListDeleter>;

bool isPort(std::string_view text) {
  if (text.empty() || text.size() > 5) return false;
  unsigned value = 0;
  for (const char c : text) {
    if (c < '0' || c > '9') return false;
    value = value * 10 + static_cast<unsigned>(c - '0');
  }
  return value >= 1 && value <= 65535;
}

/// Parses "host", "host:port", "[v6]" and "[v6]:port". A bare IPv6 address (several colons) is a host.
std::optional<Endpoint> parseEntry(std::string_view entry, std::string_view defaultPort) {
  std::string_view host = entry;
  std::string_view port = defaultPort;
  if (!entry.empty() && entry.front() == '[') {
    const auto bracket = entry.find(']');
    if (bracket == std::string_view::npos) return std::nullopt;
    host = entry.substr(1, bracket - 1);
    const std::string_view rest = entry.substr(bracket + 1);
    if (!rest.empty() && rest.front() != ':') return std::nullopt;
    if (!rest.empty()) port = rest.substr(1);
  } else if (std::count(entry.begin(), entry.end(), ':') == 1) {
    const auto colon = entry.find(':');
    host = entry.substr(0, colon);
    port = entry.substr(colon + 1);
  }
  if (host.empty() || !isPort(port)) return std::nullopt;
  return Endpoint{std::string(host), std::string(port)};
}

AddressList resolveNow(const Endpoint& endpoint, int flags) {
  addrinfo hints{};
  hints.ai_family = AF_UNSPEC;
  hints.ai_socktype = SOCK_STREAM;
  hints.ai_flags = flags | AI_NUMERICSERV;
  addrinfo* list = nullptr;
  if (getaddrinfo(endpoint.host.c_str(), endpoint.port.c_str(), &hints, &list) != 0) return nullptr;
  return AddressList(list);
}

int millisecondsUntil(Clock::time_point deadline) {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count();
  return static_cast<int>(std::clamp<std::int64_t>(left, 0, 60000));
}

/// Waits until `fd` reports one of `events` or an error. @return false when `patience` ran out first
bool awaitEvent(int fd, short events, const Patience& patience) {
  pollfd polled[2] = {{fd, events, 0}, {patience.wake, POLLIN, 0}};
  for (;;) {
    const int ready = poll(polled, 2, millisecondsUntil(patience.deadline));
    if (ready > 0) return polled[1].revents == 0;
    if (ready == 0 || errno != EINTR) return false;
  }
}

/// Shared by a resolver thread and a caller that may have stopped waiting for it.
struct Lookup {
  UniqueFd done{eventfd(0, EFD_CLOEXEC)};
  std::mutex mutex;
  AddressList addresses;  // guarded by mutex
};

/// getaddrinfo has no time limit (unreachable name servers take half a minute). It runs on a thread of its
/// own, which is abandoned when time runs out.
AddressList resolve(const Endpoint& endpoint, const Patience& patience) {
  if (AddressList numeric = resolveNow(endpoint, AI_NUMERICHOST)) return numeric;
  const auto lookup = std::make_shared<Lookup>();
  try {
    std::thread([lookup, endpoint] {
      AddressList addresses = resolveNow(endpoint, 0);
      const std::lock_guard lock(lookup->mutex);
      lookup->addresses = std::move(addresses);
      eventfd_write(lookup->done.get(), 1);
    }).detach();
  } catch (const std::system_error&) {
    return nullptr;
  }
  awaitEvent(lookup->done.get(), POLLIN, patience);
  const std::lock_guard lock(lookup->mutex);
  return std::move(lookup->addresses);
}

/// Waits until the connection is established or has failed. @return whether it is established
bool awaitConnected(int fd, const Patience& patience) {
  if (!awaitEvent(fd, POLLOUT, patience)) return false;
  int error = 0;
  socklen_t size = sizeof error;
  return getsockopt(fd, SOL_SOCKET, SO_ERROR, &error, &size) == 0 && error == 0;
}

UniqueFd connectTo(const addrinfo& address, const Patience& patience) {
  UniqueFd fd(
      socket(address.ai_family, address.ai_socktype | SOCK_CLOEXEC | SOCK_NONBLOCK, address.ai_protocol));
  if (!fd.valid()) return {};
  const int result = connect(fd.get(), address.ai_addr, address.ai_addrlen);
  if (result != 0 && errno != EINPROGRESS && errno != EINTR) return {};
  if (result != 0 && !awaitConnected(fd.get(), patience)) return {};
  // Non-blocking mode served only the time limit. The caller expects a blocking socket.
  const int flags = fcntl(fd.get(), F_GETFL);
  if (flags < 0 || fcntl(fd.get(), F_SETFL, flags & ~O_NONBLOCK) != 0) return {};
  return fd;
}

UniqueFd connectToHost(const Endpoint& endpoint, int wake) {
  const auto deadline = Clock::now() + kTimePerHost;
  const AddressList addresses = resolve(endpoint, {deadline, wake});
  int left = 0;
  for (const addrinfo* address = addresses.get(); address != nullptr; address = address->ai_next) ++left;
  for (const addrinfo* address = addresses.get(); address != nullptr; address = address->ai_next) {
    // Each address gets an equal share of the time left, so that one that doesn't answer can't use it all.
    const auto now = Clock::now();
    UniqueFd fd = connectTo(*address, {now + (deadline - now) / left--, wake});
    if (fd.valid()) return fd;
  }
  return {};
}

}  // namespace

int lmp_connect_multiple(const std::vector<std::string>& hosts, const std::string& port, int* socketOut,
                         int wake) {
  if (socketOut == nullptr) return -1;
  *socketOut = -1;
  for (const std::string& entry : hosts) {
    if (isReadable(wake)) break;
    const auto endpoint = parseEntry(entry, port);
    if (!endpoint) continue;
    UniqueFd fd = connectToHost(*endpoint, wake);
    if (!fd.valid()) continue;
    *socketOut = fd.release();
    return 0;
  }
  return -1;
}

}  // namespace lmx
