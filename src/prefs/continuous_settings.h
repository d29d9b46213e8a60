// The "ContinuousRecording" dictionary of the preferences.
#pragma once
#include "model/continuous_recording.h"
#include "platform/plist/property_list.h"

namespace lmx {

/// A missing key reads as 0 or false.
LMRContinuousRecordingInfo continuousInfoFrom(const PlistDictionary& dictionary);
/// Whether continuous recording is off, or on with a cut-off and a segment length. Logs an error otherwise.
bool continuousInfoValid(const LMRContinuousRecordingInfo& info);

}  // namespace lmx
