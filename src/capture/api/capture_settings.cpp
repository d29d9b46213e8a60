// Describes a recording context in words.
#include "capture/api/capture_settings.h"

#include "support/format.h"
#include "support/redacted.h"

namespace lmx {

std::string describe(const LMRRecordingContext& context) {
  static constexpr const char* kTypes[] = {"Audio+Video", "Audio", "Video", "File"};
  return redacted(string_with_format(
      "type %s, video %s, audio %s, repository %s, disk cut-off %lld MB, preview every %lld ms, continuous "
      "%s",
      kTypes[static_cast<int>(context.captureType)],
      context.videoEnabled ? context.videoDeviceID.value_or("none").c_str() : "off",
      context.audioEnabled ? context.audioDeviceID.value_or("default").c_str() : "off",
      context.captureTempDir.c_str(), static_cast<long long>(context.diskSpaceCutoffInMB),
      static_cast<long long>(context.previewIntervalInMilliseconds),
      context.continuous.enabled ? "on" : "off"));
}

}  // namespace lmx
