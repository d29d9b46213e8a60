// The clock behind the deadlines of a recording.
#pragma once
#include <cstdint>

namespace lmx {

/// Seconds that the wall clock is ahead of the time since the machine started (sleep included), which no
/// setting of the clock moves.
std::int64_t wallClockOffset();

}  // namespace lmx
