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

CaptureError missing(const char* problem) { return {CaptureError::kDomain, kDeviceNotFound, problem}; }

CaptureSource sourceOf(const LMRRecordingContext& settings,
                       const std::function<std::optional<std::string>()>& defaultMicrophone) {
  CaptureSource source;
  if (settings.videoEnabled) source.videoDevice = settings.videoDeviceID;
  if (settings.audioEnabled)
    source.audioDevice = settings.audioDeviceID ? settings.audioDeviceID : defaultMicrophone();
  source.frameRate = frameRateFrom(settings.maximumFrameRate);
  if (settings.audioCompressionOptions) {
    source.sampleRate = settings.audioCompressionOptions->sampleRate;
    source.channels = settings.audioCompressionOptions->channels;
  }
  return source;
}

MovieEncoding encodingOf(const LMRRecordingContext& settings, const CaptureSource& source) {
  MovieEncoding encoding;
  if (settings.videoEnabled) {
    const auto& options = settings.videoCompressionOptions;
    encoding.video = {.size = {},
                      .frameRate = source.frameRate,
                      .quality = options ? options->quality : RecordingQuality::better};
  }
  if (settings.audioEnabled) encoding.audio = {.sampleRate = source.sampleRate, .channels = source.channels};
  return encoding;
}

}  // namespace

Result<RecordingPlan, CaptureError> planRecording(
    const LMRRecordingContext& settings,
    const std::function<std::optional<std::string>()>& defaultMicrophone) {
  RecordingPlan plan{.uuid = settings.uuid,
                     .repository = settings.captureTempDir,
                     .type = recordingTypeOf(settings.captureType),
                     .source = sourceOf(settings, defaultMicrophone),
                     .encoding = {},
                     .maxDuration = {}};
  if (settings.videoEnabled && !plan.source.videoDevice) return missing("no camera is there");
  if (settings.audioEnabled && !plan.source.audioDevice) return missing("no microphone is there");
  plan.encoding = encodingOf(settings, plan.source);
  if (settings.maxDurationMinutes > 0) plan.maxDuration = std::chrono::minutes(settings.maxDurationMinutes);
  return plan;
}

}  // namespace lmx
