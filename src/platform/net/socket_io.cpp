// Sends whole replies and waits for descriptors without getting stuck on a peer.
#include "platform/net/socket_io.h"

#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <vector>

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;

/// The system calls a socket writable only when a good part of its buffer is free. For a peer that reads a
/// few bytes at a time that is long after the first byte could have been sent: so it is tried now and then.
constexpr std::chrono::milliseconds kTryAgainAfter{500};

/// Waits until another send is worth trying. @return 0, or the errno of the failure
int awaitWritable(int socket, Clock::time_point deadline, int wake) {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
  if (left.count() <= 0) return ETIMEDOUT;
  std::array<pollfd, 2> waited{{{socket, POLLOUT, 0}, {wake, POLLIN, 0}}};
  const auto wait = static_cast<int>(std::min(left, kTryAgainAfter).count());
  if (::poll(waited.data(), waited.size(), wait) < 0) return errno == EINTR ? 0 : errno;
  return waited[1].revents != 0 ? ECANCELED : 0;  // errors of the socket: the next send reports them
}

}  // namespace

int sendWhole(int socket, std::string_view bytes, std::chrono::milliseconds limit, int wake) {
  const auto deadline = Clock::now() + limit;
  while (true) {
    const ssize_t sent = ::send(socket, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
    if (sent >= 0) {
      bytes.remove_prefix(static_cast<std::size_t>(sent));
      if (bytes.empty()) return 0;
    } else if (errno == EAGAIN) {
      if (const int error = awaitWritable(socket, deadline, wake); error != 0) return error;
    } else if (errno != EINTR) {
      return errno;
    }
  }
}

Readiness awaitReadable(int descriptor, int wake, std::chrono::milliseconds limit,
                        std::span<const int> others) {
  std::vector<pollfd> waited{{descriptor, POLLIN, 0}, {wake, POLLIN, 0}};
  for (const int other : others) waited.push_back({other, POLLIN, 0});
  const int ready = ::poll(waited.data(), waited.size(), static_cast<int>(limit.count()));
  if (ready < 0) return errno == EINTR ? Readiness::interrupted : Readiness::failed;
  if (waited[1].revents != 0) return Readiness::woken;
  if (ready == 0) return Readiness::timedOut;
  if (std::any_of(waited.begin() + 2, waited.end(), [](const pollfd& other) { return other.revents != 0; }))
    return Readiness::otherReadable;
  return (waited[0].revents & POLLNVAL) != 0 ? Readiness::badDescriptor : Readiness::readable;
}

bool isReadable(int descriptor) {
  pollfd asked{descriptor, POLLIN, 0};
  return ::poll(&asked, 1, 0) > 0;
}

bool peerIsConnected(int socket) {
  constexpr short kEveryEvent = 0x1FF;
  pollfd asked{socket, static_cast<short>(kEveryEvent | POLLRDHUP), 0};
  if (::poll(&asked, 1, 0) < 0) return false;
  return (asked.revents & (POLLHUP | POLLRDHUP | POLLNVAL)) == 0;
}

}  // namespace lmx
