// How a listening channel gets its next peer, and which of several it hears.
#include "control/channel/peer_acceptor.h"

#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "platform/net/socket_io.h"
#include "support/format.h"

namespace lmx {

using namespace std::chrono_literals;

void PeerAcceptor::close() {
  listening_ = -1;
  parked_.closeAll();
}

int PeerAcceptor::acceptPeer() {
  if (takeBackSilent()) return 0;
  int previous = channel_.sockets.previous();
  for (;;) {
    std::vector<int> others{previous};
    parked_.addDescriptors(others);
    const Readiness readiness = awaitReadable(listening_, channel_.wake, -1ms, others);
    if (readiness == Readiness::woken) return -1;
    if (readiness == Readiness::interrupted) continue;
    if (readiness != Readiness::otherReadable) break;
    if (channel_.sockets.previousSpeaks()) return -1;
    if (takeSpeaking()) return 0;
    if (isReadable(previous)) previous = -1;  // it has gone
  }
  UniqueFd peer = acceptNext();
  if (!peer.valid()) return -1;
  heard();
  return setCurrent(std::move(peer)) ? 0 : -1;
}

/// @return the next peer's socket; none when it could not be taken on (logged)
UniqueFd PeerAcceptor::acceptNext() {
  UniqueFd peer(::accept4(listening_, nullptr, nullptr, SOCK_CLOEXEC));
  const int error = errno;
  channel_.context.logInfo(
      string_with_format("accepted connection fd = %d from listen fd = %d", peer.get(), listening_));
  // The peer stays in the queue while the machine has no descriptor for it: don't spin on that.
  if (!peer.valid() && (error == EMFILE || error == ENFILE || error == ENOBUFS || error == ENOMEM))
    channel_.clock.sleep(100ms, channel_.wake);
  return peer;
}

/// @return false when the listening socket refused the keep-alive option
bool PeerAcceptor::setCurrent(UniqueFd peer) {
  channel_.sockets.setCurrent(std::move(peer));
  if (left_over_.partialCommand()) channel_.line = std::exchange(left_over_, LineAssembler());
  const int on = 1;
  return ::setsockopt(listening_, SOL_SOCKET, SO_KEEPALIVE, &on, sizeof on) == 0;
}

std::chrono::milliseconds PeerAcceptor::silenceLeft() const {
  const auto left = heard_ + silence_ - channel_.clock.steadyNow();
  return std::max(std::chrono::ceil<std::chrono::milliseconds>(left), 0ms);
}

std::chrono::milliseconds PeerAcceptor::addOthers(std::vector<int>& polled) const {
  parked_.addDescriptors(polled);
  const auto left = silenceLeft();
  if (left > 0ms) return left;
  polled.push_back(listening_);
  return std::chrono::milliseconds::max();
}

bool PeerAcceptor::takeSpeaking() {
  auto speaking = parked_.takeSpeaking();
  if (!speaking) return false;
  channel_.context.logDebug("A peer that was set aside speaks again");
  putInPlace(std::move(*speaking));
  return true;
}

/// With nobody else there, the one that was set aside last is the present one again, as it would be had
/// nobody come in between: a timed command may have something to say to it. Its silence has lasted already:
/// whoever comes is served at once.
bool PeerAcceptor::takeBackSilent() {
  // The previous peer may have left its last words before it hung up.
  if (isReadable(listening_) || channel_.sockets.previousSpeaks() || channel_.sockets.previousIfAlive() != -1)
    return false;
  auto last = parked_.takeLast();
  if (!last) return false;
  putInPlace(std::move(*last));
  heard_ = {};
  channel_.context.logDebug("Nobody else is there: the peer that was set aside last has its place again");
  return true;
}

void PeerAcceptor::putInPlace(ParkedPeer peer) {
  setAside();
  channel_.sockets.restore(std::move(peer.connection));
  channel_.line = std::move(peer.line);
}

void PeerAcceptor::takeWaiting() {
  if (silenceLeft() > 0ms || !isReadable(listening_)) return;
  UniqueFd peer = acceptNext();
  if (!peer.valid()) return;
  channel_.context.logDebug(
      "Nobody has said anything for some time: the present peer is set aside for the next");
  setAside();
  setCurrent(std::move(peer));
}

/// Parks the present peer, or the one that has just lost its place and doesn't know it, with what it has left
/// unfinished.
void PeerAcceptor::setAside() {
  PeerConnection peer = channel_.sockets.takeCurrent();
  if (!peer.socket.valid() && channel_.sockets.previousIfAlive() != -1)
    peer = channel_.sockets.takePrevious();
  if (!peer.socket.valid()) {
    left_over_ = std::exchange(channel_.line, LineAssembler());
    return;
  }
  if (parked_.park({std::move(peer), std::exchange(channel_.line, LineAssembler())})) return;
  channel_.context.logInfo(string_with_format(
      "More than %zu silent peers: the one that was set aside first is closed", kParkedPeersLimit));
}

}  // namespace lmx
