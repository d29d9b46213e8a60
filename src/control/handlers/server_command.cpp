// SERVER: the server says who it is and which protocol it speaks.
#include "control/handlers/server_command.h"

#include "control/protocol/reply.h"
#include "support/scan.h"

namespace lmx {

void ServerCommand::handleSERVER(const Dictionary* parameters) {
  const auto version = lookUp(parameters, "version");
  const auto server = lookUp(parameters, "server_uuid");
  if (!version || !server) return replies_.sendReply(replyText(CommandError::missingParameter));
  const auto context = context_.get();
  const auto own = context ? context->server.server_uuid.get() : std::nullopt;
  if (own == server) {
    LMPLogMessage(context->log_context(), kLogInfo, "Server is: %s", own->c_str());
  } else {
    context_.logInfo("Server UUID does not match");
  }
  server_protocol_version_.set(decimalValue(*version));
}

}  // namespace lmx
