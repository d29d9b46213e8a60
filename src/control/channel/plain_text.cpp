// Commands and replies as plain text.
#include "control/channel/plain_text.h"

#include "platform/net/socket_io.h"
#include "support/utf8.h"

namespace lmx {

std::optional<std::string> plainCommand(const std::string& line, LMPLogContext log) {
  if (isUtf8(line)) return line;
  LMPLogMessage(log, kLogError, "Command ignored because it is not UTF-8 text");
  return std::nullopt;
}

int sendPlainReply(int socket, std::string_view reply, int wake) {
  return sendWhole(socket, reply, kReplyLimit, wake);
}

}  // namespace lmx
