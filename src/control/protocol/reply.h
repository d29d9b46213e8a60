// The text that answers a command.
#pragma once
#include <cstdint>
#include <string>

#include "model/codes.h"

namespace lmx {

/// "cmdStatus=…" for a result of the engine (RecordError) or another number. Pure.
std::string replyText(std::int32_t code);

/// The same for the reason why a command was not carried out; CommandError::none: it was.
inline std::string replyText(CommandError error) { return replyText(replyCode(error)); }

}  // namespace lmx
