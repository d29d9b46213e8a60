// The limits of a recording, from the parameters of its START.
#pragma once
#include <cstdint>
#include <string>

#include "record/stop_times.h"
#include "support/dictionary.h"

namespace lmx {

/// Seconds of hard stop for "RecordingMetadata_MAX_RECORDING_MINUTES", a decimal text that may have a
/// fraction: minutes times 60, rounded to the nearest, halves away from zero. Not a number, not finite, 0 or
/// less gives 0 (no hard stop); more than 32 bits hold gives the most they hold.
std::int32_t hardStopSeconds(const std::string& minutes);

/// Minutes of media after which a capture ends: `usual`, or what a START asks for as
/// "RecordingMetadata_MAX_RECORDING_MINUTES" if that is longer, in whole minutes, rounded up. 0 (no limit)
/// when `usual` is below 1.
std::uint32_t greatestLengthInMinutes(std::int32_t usual, const std::string& askedMinutes);

/// Sets the unattended limit that `parameters` name; one that is missing or empty stays as it was.
void configureUnattendedLimit(const Dictionary& parameters, StopTimes& stop_times);

/// Sets both limits in the same way.
void configureStopTimes(const Dictionary& parameters, StopTimes& stop_times);

}  // namespace lmx
