// How a listening channel gets its next peer, and which of several it hears.
#pragma once
#include <chrono>
#include <vector>

#include "control/channel/channel_clock.h"
#include "control/channel/parked_peers.h"
#include "control/channel/peer_sockets.h"
#include "control/handlers/channel_context.h"
#include "control/protocol/line_assembler.h"
#include "support/unique_fd.h"

namespace lmx {

/// Peers queue up behind the present one. When that and all others have been silent for some time, it is set
/// aside for the next: it is still heard, and has its place again as soon as it speaks. Channel thread only.
class PeerAcceptor {
 public:
  /// What a listening channel shares with it. All of them outlive it.
  struct Channel {
    const ChannelContext& context;
    PeerSockets& sockets;
    LineAssembler& line;  ///< what the present peer has left unfinished
    ChannelClock& clock;
    int wake;  ///< ends the waiting when it becomes readable
  };

  /// @param silence  how long nobody has said anything when the present peer must make room
  PeerAcceptor(const Channel& channel, std::chrono::milliseconds silence)
      : channel_(channel), silence_(silence) {}

  /// The socket to take peers from. Whoever owns it calls close() before it goes.
  void listenOn(int listening) { listening_ = listening; }
  /// Closes the peers that are set aside, and takes no more.
  void close();

  /// Waits for a peer, a new one or one that was set aside, and makes it the present one. There must be none.
  /// @return 0; -1 when there is none, as when the previous peer speaks before another one comes, or when the
  /// listening socket refused the keep-alive option.
  int acceptPeer();

  /// Adds to `polled` what is to be heard beside the present peer. @return when that may change by itself
  std::chrono::milliseconds addOthers(std::vector<int>& polled) const;
  /// Whether one that was set aside has spoken: it is the present peer now, and that is set aside.
  bool takeSpeaking();
  /// If the silence has lasted and a peer waits, that becomes the present one, which is set aside.
  void takeWaiting();
  /// The present peer has said something.
  void heard() { heard_ = channel_.clock.steadyNow(); }

 private:
  [[nodiscard]] std::chrono::milliseconds silenceLeft() const;
  UniqueFd acceptNext();
  bool setCurrent(UniqueFd peer);
  bool takeBackSilent();
  void putInPlace(ParkedPeer peer);
  void setAside();

  const Channel channel_;
  const std::chrono::milliseconds silence_;
  int listening_ = -1;
  std::chrono::steady_clock::time_point heard_{};
  LineAssembler left_over_;  ///< of a peer that has gone, for the next new one
  ParkedPeers parked_;
};

}  // namespace lmx
