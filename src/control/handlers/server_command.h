// SERVER: the server says who it is and which protocol it speaks.
#pragma once
#include <cstdint>

#include "control/handlers/channel_context.h"
#include "control/handlers/reply_sink.h"
#include "support/dictionary.h"
#include "support/shared_value.h"

namespace lmx {

class ServerCommand {
 public:
  /// Both outlive this object.
  ServerCommand(const ChannelContext& context, ReplySink& replies) : context_(context), replies_(replies) {}

  /// SERVER version=2,server_uuid=6F1C…  →  (no reply)
  void handleSERVER(const Dictionary* parameters);

  /// Protocol version that the server announced; 0 before. Thread-safe.
  [[nodiscard]] std::int32_t server_protocol_version() const { return server_protocol_version_.get(); }

 private:
  const ChannelContext& context_;
  ReplySink& replies_;
  SharedValue<std::int32_t> server_protocol_version_;
};

}  // namespace lmx
