// The sockets of the present peer and of the one before it.
#pragma once
#include <atomic>
#include <mutex>

namespace lmx {

/// Owns both. The previous peer's stays open until the next connection is made: its peer may not know that it
/// has lost its place. Thread-safe. "No socket" is -1.
class PeerSockets {
 public:
  PeerSockets() = default;
  ~PeerSockets() { closeAll(); }
  PeerSockets(const PeerSockets&) = delete;
  PeerSockets& operator=(const PeerSockets&) = delete;

  /// Held while a reply is sent: timed commands answer from the main thread, and their socket must not be
  /// closed, and its number reused, meanwhile.
  [[nodiscard]] std::mutex& sendMutex() { return send_mutex_; }

  [[nodiscard]] int current() const { return current_; }
  [[nodiscard]] int previous() const { return previous_; }
  /// Whether the present peer is still there.
  [[nodiscard]] bool connected() const;

  /// Makes `socket` the present peer's. There must be none.
  void setCurrent(int socket) { current_ = socket; }
  /// The present peer becomes the previous one. There must be no other.
  void retireCurrent() { previous_ = current_.exchange(-1); }

  /// The previous peer's socket if that may still say something, else -1.
  [[nodiscard]] int previousIfAlive() const;
  /// Whether the previous peer has said something.
  [[nodiscard]] bool previousSpeaks() const;
  /// Gives the previous peer its place again. The present peer must have none.
  void restorePrevious() { current_ = previous_.exchange(-1); }

  // Of two callers one wins and closes.
  void closeCurrent() { close(current_); }
  void closePrevious() { close(previous_); }
  void closeAll();

 private:
  void close(std::atomic<int>& socket);

  std::mutex send_mutex_;
  std::atomic<int> current_{-1};
  std::atomic<int> previous_{-1};
};

}  // namespace lmx
