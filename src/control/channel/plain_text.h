// The unencrypted transport of the listening channels: lines in, replies without a terminator out.
#pragma once
#include <optional>
#include <string>
#include <string_view>

#include "platform/log.h"

namespace lmx {

/// `line` as it stands; nothing when it isn't UTF-8 (logged): what came out of it would break the documents
/// that carry the parameters on.
std::optional<std::string> plainCommand(const std::string& line, LMPLogContext log);

/// The bytes that go out for `reply`: as many as it has characters. A reply that holds characters of more
/// than one byte therefore lacks that many bytes at its end; peers know replies by this length.
std::string_view plainReplyBytes(std::string_view reply);

/// Sends `reply` without a terminator. A peer that takes nothing for five seconds loses it.
/// @param wake  descriptor that ends the wait when readable
/// @return 0 or the errno
int sendPlainReply(int socket, std::string_view reply, int wake);

}  // namespace lmx
