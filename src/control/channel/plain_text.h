// Commands and replies as plain text.
#pragma once
#include <chrono>
#include <optional>
#include <string>
#include <string_view>

#include "platform/log.h"

namespace lmx {

/// Longest time that one reply may take. Meanwhile the channel hears nobody.
inline constexpr std::chrono::seconds kReplyLimit{30};

/// `line` as it stands; nothing when it isn't UTF-8 (logged): its parameters end up in property lists and
/// properties documents, which can't hold anything else.
std::optional<std::string> plainCommand(const std::string& line, LMPLogContext log);

/// Sends `reply` without a terminator. A peer that has not taken all of it within kReplyLimit loses the rest.
/// @param wake  descriptor that ends the wait when readable
/// @return 0 or the errno
int sendPlainReply(int socket, std::string_view reply, int wake);

}  // namespace lmx
