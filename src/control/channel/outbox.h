// Replies that were given on another thread than the channel's and wait for that to send them.
#pragma once
#include <cstddef>
#include <cstdint>
#include <deque>
#include <mutex>
#include <string>

#include "support/unique_fd.h"

namespace lmx {

/// Most replies that wait, and their bytes: a peer that doesn't read must not own the machine's memory. One
/// reply with a preview may have more than twenty million bytes.
inline constexpr std::size_t kOutboxLimit = 1000;
inline constexpr std::size_t kOutboxBytes = std::size_t{64} << 20;

/// A queue whose reader can wait for it together with its sockets. Thread-safe.
class Outbox {
 public:
  struct Entry {
    std::string reply;
    std::uint64_t connection = 0;  ///< PeerConnection::number of the one at which it was given
  };

  explicit Outbox(std::size_t limit = kOutboxLimit);

  /// Whether there is a descriptor; without one nobody would notice what is pushed.
  [[nodiscard]] bool usable() const { return ready_.valid(); }
  /// Readable while something waits.
  [[nodiscard]] int descriptor() const { return ready_.get(); }

  /// Puts `entry` behind the others. Never waits. @return false when there is no room: it is not taken
  [[nodiscard]] bool push(Entry entry);
  /// All that waits, oldest first. Nothing waits afterwards.
  [[nodiscard]] std::deque<Entry> takeAll();

 private:
  const std::size_t limit_;
  const UniqueFd ready_;  // eventfd
  std::mutex mutex_;      // guards waiting_ and its agreement with ready_
  std::deque<Entry> waiting_;
  std::size_t bytes_ = 0;  // of the replies in waiting_
};

}  // namespace lmx
