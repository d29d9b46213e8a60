// Sends whole replies and waits for descriptors without getting stuck on a peer.
#include "platform/net/socket_io.h"

#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>

namespace lmx {
namespace {

using Clock = std::chrono::steady_clock;

/// Limit on a whole send, in multiples of `patience`, for a peer that takes only a few bytes at a time.
constexpr int kPatiencesInAll = 6;

/// Waits until `socket` is writable. @return 0, or the errno of the failure
int awaitWritable(int socket, Clock::time_point deadline, int wake) {
  while (true) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
    if (left.count() <= 0) return ETIMEDOUT;
    std::array<pollfd, 2> waited{{{socket, POLLOUT, 0}, {wake, POLLIN, 0}}};
    const int ready = ::poll(waited.data(), waited.size(), static_cast<int>(left.count()));
    if (ready < 0 && errno != EINTR) return errno;
    if (ready <= 0) continue;
    if (waited[1].revents != 0) return ECANCELED;
    return 0;  // also on errors: the next send reports them
  }
}

}  // namespace

int sendWhole(int socket, std::string_view bytes, std::chrono::milliseconds patience, int wake) {
  const auto end = Clock::now() + kPatiencesInAll * patience;
  while (true) {
    const ssize_t sent = ::send(socket, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
    if (sent >= 0) {
      bytes.remove_prefix(static_cast<std::size_t>(sent));
      if (bytes.empty()) return 0;
    } else if (errno == EAGAIN) {
      if (const int error = awaitWritable(socket, std::min(Clock::now() + patience, end), wake); error != 0)
        return error;
    } else if (errno != EINTR) {
      return errno;
    }
  }
}

Readiness awaitReadable(int descriptor, int wake, std::chrono::milliseconds limit, int other) {
  std::array<pollfd, 3> waited{{{descriptor, POLLIN, 0}, {wake, POLLIN, 0}, {other, POLLIN, 0}}};
  const int ready = ::poll(waited.data(), waited.size(), static_cast<int>(limit.count()));
  if (ready < 0) return errno == EINTR ? Readiness::interrupted : Readiness::failed;
  if (waited[1].revents != 0) return Readiness::woken;
  if (ready == 0) return Readiness::timedOut;
  if (waited[2].revents != 0) return Readiness::otherReadable;
  return (waited[0].revents & POLLNVAL) != 0 ? Readiness::badDescriptor : Readiness::readable;
}

bool peerIsConnected(int socket) {
  constexpr short kEveryEvent = 0x1FF;
  pollfd asked{socket, static_cast<short>(kEveryEvent | POLLRDHUP), 0};
  if (::poll(&asked, 1, 0) < 0) return false;
  return (asked.revents & (POLLHUP | POLLRDHUP | POLLNVAL)) == 0;
}

}  // namespace lmx
