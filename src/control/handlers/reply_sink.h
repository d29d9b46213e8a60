// Where a handler's answer goes.
#pragma once
#include <string>

namespace lmx {

class ReplySink {
 public:
  /// Sends one reply to the peer. A reply that can't be sent is lost (logged). Any thread.
  virtual void sendReply(const std::string& reply) = 0;

 protected:
  ~ReplySink() = default;
};

}  // namespace lmx
