// How a listening channel gets its next peer.
#pragma once
#include "control/channel/channel_clock.h"
#include "control/channel/peer_sockets.h"
#include "control/handlers/channel_context.h"

namespace lmx {

class PeerAcceptor {
 public:
  /// All of them outlive this object. @param wake  ends the waiting when it becomes readable
  PeerAcceptor(const ChannelContext& context, PeerSockets& sockets, ChannelClock& clock, int wake)
      : context_(context), sockets_(sockets), clock_(clock), wake_(wake) {}

  /// Waits for a peer on `listening` and makes it the present one. Channel thread.
  /// @return 0; -1 when none was accepted, as when the previous peer speaks before another one comes, or when
  /// the listening socket refused the keep-alive option.
  int acceptPeer(int listening);

 private:
  const ChannelContext& context_;
  PeerSockets& sockets_;
  ChannelClock& clock_;
  const int wake_;
};

}  // namespace lmx
