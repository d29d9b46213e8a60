// From when on the signal of camera and microphone counts as trouble, as the preferences say.
#pragma once
#include <functional>
#include <optional>
#include <string>

#include "capture/api/signal_thresholds.h"

namespace lmx {

/// Reads "SignalWarningSeconds", "SignalSilenceDecibels", "SignalClippingDecibels", "SignalBlackLevel" and
/// "SignalFrozenDifference". "off" switches one off. A value that makes no sense counts as missing, with a
/// warning.
/// @param read  the text of a key
SignalThresholds signalThresholds(const std::function<std::optional<std::string>(const char* key)>& read);

}  // namespace lmx
