// The text that answers a command.
#include "control/protocol/reply.h"

namespace lmx {

std::string replyText(std::int32_t code) { return "cmdStatus=" + std::to_string(code); }

}  // namespace lmx
