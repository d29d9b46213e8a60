// Builds the registered defaults.
#include "prefs/adhoc_defaults.h"

namespace lmx {

PlistDictionary adHocDefaults() {
  return {{"RecordingType", "Audio+Video"},
          {"RecordingCapturePreset", "Video:Better"},
          {"RecordingCaptureDescription", "50% resolution H.264 Video, Stereo AAC VBR, 44 kHz sample rate"},
          {"RecordingDiskSpaceCutoffInMB", "1024"},
          {"RecordingAudioInput", "Automatic"},
          {"RecordingAudioChannel", "Stereo"},
          {"RecordingAudioSampleRate", "44"},
          {"RecordingVideoInput", "Automatic"},
          {"RecordingVideoMaximumFrameRate", "30"},
          {"RecordingVideoImagePercent", "50"},
          {"PreviewIntervalInMilliseconds", "400"}};
}

}  // namespace lmx
