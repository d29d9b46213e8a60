// How a listening channel gets its next peer.
#include "control/channel/peer_acceptor.h"

#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <chrono>

#include "platform/net/socket_io.h"
#include "support/format.h"
#include "support/unique_fd.h"

namespace lmx {

using namespace std::chrono_literals;

int PeerAcceptor::acceptPeer(int listening) {
  int previous = sockets_.previous();
  Readiness readiness = Readiness::interrupted;
  while (readiness == Readiness::interrupted || readiness == Readiness::otherReadable) {
    readiness = awaitReadable(listening, wake_, -1ms, std::array{previous});
    if (readiness != Readiness::otherReadable) continue;
    if (sockets_.previousSpeaks()) return -1;
    previous = -1;  // it has gone
  }
  if (readiness == Readiness::woken) return -1;

  const int peer = ::accept4(listening, nullptr, nullptr, SOCK_CLOEXEC);
  const int error = errno;
  sockets_.setCurrent(UniqueFd(peer));
  context_.logInfo(string_with_format("accepted connection fd = %d from listen fd = %d", peer, listening));
  if (peer == -1) {
    // The peer stays in the queue while the machine has no descriptor for it: don't spin on that.
    if (error == EMFILE || error == ENFILE || error == ENOBUFS || error == ENOMEM) clock_.sleep(100ms, wake_);
    return -1;
  }
  const int on = 1;
  return ::setsockopt(listening, SOL_SOCKET, SO_KEEPALIVE, &on, sizeof on) == 0 ? 0 : -1;
}

}  // namespace lmx
