// Reads and validates the continuous-recording settings.
#include "prefs/continuous_settings.h"

#include "platform/log.h"

namespace lmx {

LMRContinuousRecordingInfo continuousInfoFrom(const PlistDictionary& dictionary) {
  const auto value = [&dictionary](const char* key) {
    const auto found = dictionary.find(key);
    return found == dictionary.end() ? PlistValue(false) : found->second;
  };
  return {.cutoffPercentLeft = value("RecordingDiskSpaceCutoffPercentLeft").asReal(),
          .segmentLength = static_cast<std::uint64_t>(value("RecordingSegmentLength").asInteger()),
          .upload = value("ContinuousUpload").asBool(),
          .enabled = value("Enabled").asBool()};
}

bool continuousInfoValid(const LMRContinuousRecordingInfo& info) {
  if (!info.enabled || (info.cutoffPercentLeft > 0.0 && info.segmentLength != 0)) return true;
  LMPLogMessage(nullptr, kLogCritical, "Continuous capture is enabled, but the preferences are invalid.");
  return false;
}

}  // namespace lmx
