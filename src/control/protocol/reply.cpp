// The text that answers a command, and the bytes that go out for it.
#include "control/protocol/reply.h"

#include "support/utf8.h"

namespace lmx {

std::string replyText(std::int32_t code) { return "cmdStatus=" + std::to_string(code); }

std::string_view replyBytes(std::string_view reply) { return reply.substr(0, characterCount(reply)); }

}  // namespace lmx
