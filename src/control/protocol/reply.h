// The text that answers a command, and the bytes that go out for it.
#pragma once
#include <cstdint>
#include <string>
#include <string_view>

#include "model/codes.h"

namespace lmx {

/// "cmdStatus=…" for a result of the engine (RecordError) or another number. Pure.
std::string replyText(std::int32_t code);

/// The same for the reason why a command was not carried out; CommandError::none: it was.
inline std::string replyText(CommandError error) { return replyText(replyCode(error)); }

/// The bytes that go out for `reply`: as many as it has characters. A reply that holds characters of more
/// than one byte therefore lacks that many bytes at its end; peers know replies by this length. Pure.
std::string_view replyBytes(std::string_view reply);

}  // namespace lmx
