// What the parameters of a START say about the limits of the recording.
#pragma once
#include <cstdint>
#include <string>

namespace lmx {

/// Seconds of hard stop for "RecordingMetadata_MAX_RECORDING_MINUTES", a decimal text that may have a
/// fraction: minutes times 60, rounded to the nearest, halves away from zero. Not a number, not finite, 0 or
/// less gives 0 (no hard stop); more than 32 bits hold gives the most they hold.
std::int32_t hardStopSeconds(const std::string& minutes);

}  // namespace lmx
