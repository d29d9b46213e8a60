// Commands and replies as plain text.
#include "control/channel/plain_text.h"

#include <chrono>

#include "control/protocol/reply.h"
#include "platform/net/socket_io.h"
#include "support/utf8.h"

namespace lmx {
namespace {

constexpr std::chrono::seconds kReplyPatience{5};

}  // namespace

std::optional<std::string> plainCommand(const std::string& line, LMPLogContext log) {
  if (isUtf8(line)) return line;
  LMPLogMessage(log, kLogError, "Command ignored because it is not UTF-8 text");
  return std::nullopt;
}

int sendPlainReply(int socket, std::string_view reply, int wake) {
  return sendWhole(socket, replyBytes(reply), kReplyPatience, wake);
}

}  // namespace lmx
