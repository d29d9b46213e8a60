// Works out devices and encoding of a recording from its settings, before anything is opened.
#pragma once
#include <chrono>
#include <functional>
#include <optional>
#include <string>

#include "capture/api/capture_framework.h"
#include "capture/gst/encoding.h"
#include "capture/source/capture_source.h"
#include "model/codes.h"
#include "support/result.h"

namespace lmx {

struct RecordingPlan {
  std::string uuid;
  std::string repository;
  RecordingTypeCode type = kRecordingTypeAudioVideo;  ///< for the journal
  CaptureSource source;
  MovieEncoding encoding;  ///< the picture's size is known when the first frame comes
  std::optional<std::chrono::minutes> maxDuration;
};

/// @param defaultMicrophone  asked when the settings name no microphone
/// @return kDeviceNotFound when there is no device for a medium
Result<RecordingPlan, CaptureError> planRecording(
    const LMRRecordingContext& settings,
    const std::function<std::optional<std::string>()>& defaultMicrophone);

}  // namespace lmx
