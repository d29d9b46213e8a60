// Works out devices and encoding of a recording from its settings, before anything is opened.
#pragma once
#include <chrono>
#include <optional>
#include <string>

#include "capture/api/capture_framework.h"
#include "capture/gst/encoding.h"
#include "capture/source/source.h"
#include "model/codes.h"
#include "support/result.h"

namespace lmx {

struct RecordingPlan {
  std::string uuid;
  std::string repository;
  RecordingTypeCode type = kRecordingTypeAudioVideo;  ///< for the journal
  std::optional<std::string> camera;                  ///< unique identifier
  std::optional<std::string> microphone;              ///< the same; may be the camera's, or kAnyMicrophone
  CameraDemand demand;                                ///< what is wanted of the camera at most
  SignalThresholds signal;                            ///< what counts as trouble with picture or sound
  MovieEncoding encoding;                             ///< size and rate are the camera's: completeEncoding
  std::optional<std::chrono::minutes> maxDuration;
};

/// @return kDeviceNotFound when there is no camera, or something that can't be an identifier
Result<RecordingPlan, CaptureError> planRecording(const LMRRecordingContext& settings);

/// The plan's encoding for what the camera gives. The movie's clock ticks at the camera's nominal rate if
/// that makes sense and is not above the wanted one, else at the wanted one. Its size is the camera's, no
/// larger than wanted.
MovieEncoding completeEncoding(const RecordingPlan& plan, const CameraFormat& camera);

}  // namespace lmx
