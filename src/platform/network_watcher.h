// Watches the IPv4 addresses of all network interfaces (rtnetlink, RFC 3549).
#pragma once
#include <cstdint>
#include <functional>
#include <memory>
#include <set>
#include <string_view>
#include <utility>

#include "platform/run_loop.h"
#include "support/unique_fd.h"

namespace lmx {

/// Interface index and address (network order).
using InterfaceAddress = std::pair<unsigned, std::uint32_t>;

/// Takes the address messages in `bytes` into `known`. An address that is announced again, as a renewed lease
/// does, is no change. @return whether `known` changed. Pure.
bool applyAddressMessages(std::string_view bytes, std::set<InterfaceAddress>& known);

/// One thread.
class NetworkWatcher {
 public:
  /// @return 0 or the errno
  int open();
  /// Readable when there may be something to take; -1 before open.
  [[nodiscard]] int descriptor() const { return socket_.get(); }
  /// Takes what has come. @return whether an address came or went since the last call
  bool takeChanges();

 private:
  UniqueFd socket_;
  std::set<InterfaceAddress> known_;
};

/// Has `changed` called on the thread of `loop` whenever an address comes or goes, for as long as the result
/// lives.
/// @return null when the network can't be watched
std::unique_ptr<RunLoop::Source> watchNetwork(RunLoop& loop, std::function<void()> changed);

}  // namespace lmx
