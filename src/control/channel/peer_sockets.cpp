// The sockets of the present peer and of the one before it.
#include "control/channel/peer_sockets.h"

#include <sys/socket.h>

#include <utility>

#include "platform/net/socket_io.h"

namespace lmx {

int PeerSockets::current() const {
  const std::lock_guard lock(mutex_);
  return current_.socket.get();
}

int PeerSockets::previous() const {
  const std::lock_guard lock(mutex_);
  return previous_.socket.get();
}

bool PeerSockets::connected() const {
  // Under the lock, or the channel's thread might close the descriptor meanwhile. It doesn't wait.
  const std::lock_guard lock(mutex_);
  return current_.socket.valid() && peerIsConnected(current_.socket.get());
}

std::uint64_t PeerSockets::replyTarget() const {
  const std::lock_guard lock(mutex_);
  return current_.greeted ? current_.number : 0;
}

/// What stood in the place is closed when the lock is free again.
void PeerSockets::exchange(PeerConnection& place, PeerConnection connection) {
  const std::lock_guard lock(mutex_);
  std::swap(place, connection);
}

void PeerSockets::setCurrent(UniqueFd socket, Greeting greeting) {
  if (!socket.valid()) return closeCurrent();
  PeerConnection connection{std::move(socket), 0, greeting == Greeting::none};
  {
    const std::lock_guard lock(mutex_);
    connection.number = ++last_number_;
  }
  exchange(current_, std::move(connection));
}

void PeerSockets::setGreeted() {
  const std::lock_guard lock(mutex_);
  current_.greeted = current_.socket.valid();
}

void PeerSockets::retireCurrent() { exchange(previous_, takeCurrent()); }

PeerConnection PeerSockets::takeCurrent() {
  const std::lock_guard lock(mutex_);
  return std::exchange(current_, {});
}

PeerConnection PeerSockets::takePrevious() {
  const std::lock_guard lock(mutex_);
  return std::exchange(previous_, {});
}

void PeerSockets::restore(PeerConnection connection) { exchange(current_, std::move(connection)); }

int PeerSockets::previousIfAlive() const {
  const int socket = previous();
  return socket != -1 && peerIsConnected(socket) ? socket : -1;
}

bool PeerSockets::previousSpeaks() const {
  char next = 0;
  return ::recv(previous(), &next, 1, MSG_PEEK | MSG_DONTWAIT) > 0;
}

void PeerSockets::restorePrevious() { restore(takePrevious()); }

void PeerSockets::closeCurrent() { exchange(current_, {}); }

void PeerSockets::closePrevious() { exchange(previous_, {}); }

void PeerSockets::closeAll() {
  closeCurrent();
  closePrevious();
}

}  // namespace lmx
