// What the parameters of a START say about the recording: its limits, and who submits it.
#pragma once
#include <cstdint>
#include <string>

#include "model/run_options.h"
#include "record/stop_times.h"
#include "support/dictionary.h"

namespace lmx {

/// Seconds of hard stop for "RecordingMetadata_MAX_RECORDING_MINUTES", a decimal text that may have a
/// fraction: minutes times 60, rounded to the nearest, halves away from zero. Not a number, not finite, 0 or
/// less gives 0 (no hard stop); more than 32 bits hold gives the most they hold.
std::int32_t hardStopSeconds(const std::string& minutes);

/// Sets the limits that `parameters` name; one that is missing or empty stays as it was.
void configureStopTimes(const Dictionary& parameters, StopTimes& stop_times);

/// Sets the user and the password of the submission in the same way.
void configureSubmission(const Dictionary& parameters, RunOptions& options);

}  // namespace lmx
