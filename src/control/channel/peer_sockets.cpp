// The sockets of the present peer and of the one before it.
#include "control/channel/peer_sockets.h"

#include <sys/socket.h>

#include "platform/net/socket_io.h"
#include "support/unique_fd.h"

namespace lmx {

bool PeerSockets::connected() const {
  const int socket = current_;
  return socket != -1 && peerIsConnected(socket);
}

int PeerSockets::previousIfAlive() const {
  const int socket = previous_;
  return socket != -1 && peerIsConnected(socket) ? socket : -1;
}

bool PeerSockets::previousSpeaks() const {
  char next = 0;
  return ::recv(previous_, &next, 1, MSG_PEEK | MSG_DONTWAIT) > 0;
}

void PeerSockets::close(std::atomic<int>& socket) {
  const std::lock_guard lock(send_mutex_);
  const UniqueFd closing(socket.exchange(-1));
}

void PeerSockets::closeAll() {
  closeCurrent();
  closePrevious();
}

}  // namespace lmx
