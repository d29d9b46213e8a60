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

/// Interface index and address (network byte order).
using InterfaceAddress = std::pair<unsigned, std::uint32_t>;

/// Applies the address messages in `bytes` to `known`. An address announced again, as on a lease renewal, is
/// no change. Pure. @return whether `known` changed
bool applyAddressMessages(std::string_view bytes, std::set<InterfaceAddress>& known);

/// For use on one thread.
class NetworkWatcher {
 public:
  /// @return 0 or the errno
  int open();
  /// Readable when takeChanges() has something to read; -1 before open().
  [[nodiscard]] int descriptor() const { return socket_.get(); }
  /// Reads the pending messages. @return whether an address came or went since the last call
  bool takeChanges();

 private:
  UniqueFd socket_;
  std::set<InterfaceAddress> known_;
};

/// Calls `changed` on the thread of `loop` whenever an address comes or goes, for as long as the result
/// lives.
/// @return null when the network can't be watched
std::unique_ptr<RunLoop::Source> watchNetwork(RunLoop& loop, std::function<void()> changed);

}  // namespace lmx
