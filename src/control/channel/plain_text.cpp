// The unencrypted transport of the listening channels: lines in, replies without a terminator out.
#include "control/channel/plain_text.h"

#include <chrono>

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

std::string_view plainReplyBytes(std::string_view reply) { return reply.substr(0, characterCount(reply)); }

int sendPlainReply(int socket, std::string_view reply, int wake) {
  return sendWhole(socket, plainReplyBytes(reply), kReplyPatience, wake);
}

}  // namespace lmx
