// Peers that were silent when others waited: set aside, but still heard.
#include "control/channel/parked_peers.h"

#include <sys/socket.h>

#include <cerrno>
#include <utility>

namespace lmx {
namespace {

enum class Heard { nothing, words, end };

Heard listenTo(const ParkedPeer& peer) {
  char next = 0;
  const ssize_t got = ::recv(peer.connection.socket.get(), &next, 1, MSG_PEEK | MSG_DONTWAIT);
  if (got > 0) return Heard::words;
  return got < 0 && (errno == EAGAIN || errno == EINTR) ? Heard::nothing : Heard::end;
}

}  // namespace

bool ParkedPeers::park(ParkedPeer peer) {
  peers_.push_back(std::move(peer));
  if (peers_.size() <= limit_) return true;
  peers_.pop_front();
  return false;
}

std::optional<ParkedPeer> ParkedPeers::takeSpeaking() {
  for (auto peer = peers_.begin(); peer != peers_.end();) {
    const Heard heard = listenTo(*peer);
    if (heard == Heard::nothing) {
      ++peer;
      continue;
    }
    ParkedPeer taken = std::move(*peer);
    peer = peers_.erase(peer);
    if (heard == Heard::words) return taken;
  }
  return std::nullopt;
}

std::optional<ParkedPeer> ParkedPeers::takeLast() {
  if (peers_.empty()) return std::nullopt;
  ParkedPeer last = std::move(peers_.back());
  peers_.pop_back();
  return last;
}

void ParkedPeers::addDescriptors(std::vector<int>& polled) const {
  for (const ParkedPeer& peer : peers_) polled.push_back(peer.connection.socket.get());
}

}  // namespace lmx
