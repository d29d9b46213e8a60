// A client of the running daemon's local control socket.
#pragma once
#include <functional>
#include <string>

#include "support/unique_fd.h"

namespace lmx {

/// One connection, closed with the object. Not thread-safe.
class ClientConnect {
 public:
  /// Asked some times a second while the reply is awaited; false: it is not worth waiting for any more.
  using Patience = std::function<bool()>;

  ClientConnect() = default;
  ~ClientConnect() { close(); }
  ClientConnect(const ClientConnect&) = delete;
  ClientConnect& operator=(const ClientConnect&) = delete;

  /// Connects to "/var/run/lmxagentd.comm". @return 0, or -1 when nobody listens there
  int connect();
  /// Sends `command` (with its line feed) and receives once, at most 1023 bytes: that is the whole reply, a
  /// longer or a split one is cut.
  /// @param response  gets the reply, an empty text when the patience ended first; may be null
  /// @return 0, or -1 when there is no connection or it broke
  int execCommand(const std::string& command, std::string* response, const Patience& patience);
  void close() { sock_.reset(); }

 private:
  UniqueFd sock_;
};

}  // namespace lmx
