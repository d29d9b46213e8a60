// The connection to the log daemon: never blocks, and counts what it had to drop.
#pragma once
#include <chrono>
#include <functional>
#include <string>
#include <string_view>

#include "support/unique_fd.h"

namespace lmx {

/// Not thread-safe; its owner locks.
class LogSocket {
 public:
  /// Connects now rather than at the first message; nobody listening is no failure.
  void connect();

  /// Sends the datagram of a message. What the daemon can't take is counted, and reported by a message of its
  /// own before the next one that goes out.
  /// @param lostNotice  makes the datagram of a text that tells of lost messages
  void send(std::string_view datagram, const std::function<std::string(const std::string& text)>& lostNotice);

 private:
  bool ensureConnected();
  bool deliver(std::string_view datagram);

  UniqueFd socket_;
  unsigned long lost_ = 0;
  std::chrono::steady_clock::time_point next_attempt_{};
};

}  // namespace lmx
