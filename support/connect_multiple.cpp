// Resolving and connecting, one host after the other.
#include "support/connect_multiple.h"

#include <fcntl.h>
#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <memory>

#include "support/unique_fd.h"

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;
constexpr std::chrono::seconds kHostLimit{10};

struct HostAndPort {
  std::string host;
  std::string port;
};

HostAndPort splitEntry(const std::string& entry, const std::string& defaultPort) {
  if (!entry.empty() && entry[0] == '[') {
    const std::size_t close = entry.find(']');
    if (close == std::string::npos) return {entry, defaultPort};
    const bool hasPort = close + 1 < entry.size() && entry[close + 1] == ':';
    return {entry.substr(1, close - 1), hasPort ? entry.substr(close + 2) : defaultPort};
  }
  const std::size_t colon = entry.find(':');
  // More than one colon without brackets is an IPv6 address.
  if (colon == std::string::npos || entry.find(':', colon + 1) != std::string::npos)
    return {entry, defaultPort};
  return {entry.substr(0, colon), entry.substr(colon + 1)};
}

int connectTo(const addrinfo& address, Clock::time_point deadline) {
  UniqueFd fd(socket(address.ai_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!fd.valid()) return -1;
  if (connect(fd.get(), address.ai_addr, address.ai_addrlen) != 0) {
    if (errno != EINPROGRESS) return -1;
    pollfd waiting{fd.get(), POLLOUT, 0};
    int ready = 0;
    do {
      const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now());
      ready = poll(&waiting, 1, static_cast<int>(std::max<std::int64_t>(0, left.count())));
    } while (ready < 0 && errno == EINTR);
    int error = 0;
    socklen_t size = sizeof error;
    if (ready != 1 || getsockopt(fd.get(), SOL_SOCKET, SO_ERROR, &error, &size) != 0 || error != 0) return -1;
  }
  fcntl(fd.get(), F_SETFL, fcntl(fd.get(), F_GETFL) & ~O_NONBLOCK);
  return fd.release();
}

int connectToHost(const HostAndPort& target) {
  addrinfo hints{};
  hints.ai_socktype = SOCK_STREAM;
  addrinfo* list = nullptr;
  if (getaddrinfo(target.host.c_str(), target.port.c_str(), &hints, &list) != 0) return -1;
  const std::unique_ptr<addrinfo, decltype(&freeaddrinfo)> owner(list, &freeaddrinfo);
  const auto deadline = Clock::now() + kHostLimit;
  for (const addrinfo* address = list; address != nullptr && Clock::now() < deadline;
       address = address->ai_next) {
    const int fd = connectTo(*address, deadline);
    if (fd >= 0) return fd;
  }
  return -1;
}

}  // namespace

int lmp_connect_multiple(const std::vector<std::string>& hosts, const std::string& port, int* socketOut) {
  *socketOut = -1;
  for (const std::string& entry : hosts) {
    *socketOut = connectToHost(splitEntry(entry, port));
    if (*socketOut >= 0) return 0;
  }
  return -1;
}

}  // namespace lmx
