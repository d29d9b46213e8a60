// Peers that were silent when others waited: set aside, but still heard.
#pragma once
#include <cstddef>
#include <deque>
#include <optional>
#include <vector>

#include "control/channel/peer_sockets.h"
#include "control/protocol/line_assembler.h"

namespace lmx {

/// Most peers that are set aside: each costs a descriptor.
inline constexpr std::size_t kParkedPeersLimit = 64;

/// A peer that is not the present one, with what it has left unfinished: half a line of one peer must not
/// stand in front of another's.
struct ParkedPeer {
  PeerConnection connection;
  LineAssembler line;
};

/// Channel thread only.
class ParkedPeers {
 public:
  explicit ParkedPeers(std::size_t limit = kParkedPeersLimit) : limit_(limit) {}

  /// Sets `peer` aside. @return false when the one that has been here longest had to be closed for it
  bool park(ParkedPeer peer);
  /// Of those that have said something the one that has been here longest, no longer among them. Closes those
  /// that have hung up without a word.
  [[nodiscard]] std::optional<ParkedPeer> takeSpeaking();
  /// The one that was set aside last, no longer among them; none when there is none.
  [[nodiscard]] std::optional<ParkedPeer> takeLast();
  /// Adds their descriptors to `polled`. One of them is readable when takeSpeaking() has something to do.
  void addDescriptors(std::vector<int>& polled) const;
  void closeAll() { peers_.clear(); }

  [[nodiscard]] std::size_t size() const { return peers_.size(); }

 private:
  const std::size_t limit_;
  std::deque<ParkedPeer> peers_;  // in the order in which they were set aside
};

}  // namespace lmx
