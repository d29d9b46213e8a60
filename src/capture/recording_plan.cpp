// From the settings of a recording to its plan.
#include "capture/recording_plan.h"

namespace lmx {
namespace {

RecordingTypeCode recordingTypeOf(CaptureType type) {
  switch (type) {
    case CaptureType::audio:
      return kRecordingTypeAudio;
    case CaptureType::video:
      return kRecordingTypeVideo;
    case CaptureType::file:
      return kRecordingTypeFile;
    case CaptureType::audioAndVideo:
      break;
  }
  return kRecordingTypeAudioVideo;
}

constexpr double kLowestRate = 5;  // frames a second: below, cuts would be coarse

CaptureError missing(const std::string& problem) { return {CaptureError::kDomain, kDeviceNotFound, problem}; }

CaptureError noIdentifier(const std::string& device, const char* what) {
  return missing("\"" + device + "\" is no " + what +
                 " identifier; list them with lmxagentd -i zq-device-list");
}

MovieEncoding encodingOf(const LMRRecordingContext& settings) {
  MovieEncoding encoding;
  if (settings.videoEnabled) {
    const auto& options = settings.videoCompressionOptions;
    encoding.video = {.size = {},
                      .frameRate = frameRateFrom(settings.maximumFrameRate),
                      .quality = options ? options->quality : RecordingQuality::better};
  }
  if (settings.audioEnabled) encoding.audio = {.sampleRate = kSoundRate, .channels = kSoundChannels};
  return encoding;
}

}  // namespace

Result<RecordingPlan, CaptureError> planRecording(const LMRRecordingContext& settings) {
  RecordingPlan plan{.uuid = settings.uuid,
                     .repository = settings.captureTempDir,
                     .type = recordingTypeOf(settings.captureType),
                     .camera = {},
                     .microphone = {},
                     .demand = {.size = settings.maximumSize, .maximumRate = settings.maximumFrameRate},
                     .signal = settings.signal,
                     .encoding = encodingOf(settings),
                     .maxDuration = {}};
  if (settings.videoEnabled) plan.camera = settings.videoDeviceID;
  if (settings.audioEnabled) plan.microphone = settings.audioDeviceID.value_or(kAnyMicrophone);
  if (settings.videoEnabled && !plan.camera) return missing("no camera is there");
  if (plan.camera && parseDeviceID(*plan.camera).kind == DeviceKind::unknown)
    return noIdentifier(*plan.camera, "camera");
  const bool known = !plan.microphone || *plan.microphone == kAnyMicrophone ||
                     parseDeviceID(*plan.microphone).kind != DeviceKind::unknown;
  if (!known) return noIdentifier(*plan.microphone, "microphone");
  if (settings.maxDurationMinutes > 0) plan.maxDuration = std::chrono::minutes(settings.maxDurationMinutes);
  return plan;
}

MovieEncoding completeEncoding(const RecordingPlan& plan, const CameraFormat& camera) {
  MovieEncoding encoding = plan.encoding;
  if (!encoding.video) return encoding;
  // Another user may have opened the camera for a larger picture.
  encoding.video->size = fittedSize(camera.size.width, camera.size.height, plan.demand.size);
  const FrameRate wanted = encoding.video->frameRate;
  if (!camera.rate) return encoding;
  const double seconds = camera.rate->frameSeconds();
  if (seconds <= 1 / kLowestRate && seconds >= wanted.frameSeconds() - 1e-6)
    encoding.video->frameRate = *camera.rate;
  return encoding;
}

}  // namespace lmx
