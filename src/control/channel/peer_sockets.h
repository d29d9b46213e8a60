// The sockets of the present peer and of the one before it.
#pragma once
#include <cstdint>
#include <mutex>

#include "support/unique_fd.h"

namespace lmx {

/// One connection to a peer.
struct PeerConnection {
  UniqueFd socket;
  std::uint64_t number = 0;  ///< of no other connection of this channel; 0: there is none
  bool greeted = false;      ///< the peer may be sent replies
};

/// Whether a connection may carry replies from its beginning.
enum class Greeting { none, comesFirst };

/// Owns both. The previous peer's stays open until the next connection is made: its peer may not know that it
/// has lost its place. "No socket" is -1. Only the channel's thread, while there is one, changes what is here
/// and uses the descriptors; connected() and replyTarget() are thread-safe and never meet a closed one.
class PeerSockets {
 public:
  [[nodiscard]] int current() const;
  [[nodiscard]] int previous() const;
  /// Whether the present peer is still there.
  [[nodiscard]] bool connected() const;
  /// The number of the present connection if it may carry replies, else 0.
  [[nodiscard]] std::uint64_t replyTarget() const;

  /// Makes `socket` the present peer's, in the place of any other.
  /// @param greeting  comesFirst: no replies before setGreeted()
  void setCurrent(UniqueFd socket, Greeting greeting = Greeting::none);
  void setGreeted();
  /// The present peer becomes the previous one, in the place of any other.
  void retireCurrent();
  /// Takes the present, respectively the previous, peer away, for restore() to bring it back later.
  [[nodiscard]] PeerConnection takeCurrent();
  [[nodiscard]] PeerConnection takePrevious();
  void restore(PeerConnection connection);

  /// The previous peer's socket if that may still say something, else -1.
  [[nodiscard]] int previousIfAlive() const;
  /// Whether the previous peer has said something.
  [[nodiscard]] bool previousSpeaks() const;
  /// Gives the previous peer its place again.
  void restorePrevious();

  void closeCurrent();
  void closePrevious();
  void closeAll();

 private:
  void exchange(PeerConnection& place, PeerConnection connection);

  mutable std::mutex mutex_;  // guards all that follow; held for moments only
  PeerConnection current_;
  PeerConnection previous_;
  std::uint64_t last_number_ = 0;
};

}  // namespace lmx
