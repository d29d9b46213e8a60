// Builds a ready capture from the preferences.
#include "record/capture_set_up.h"

#include "model/codes.h"
#include "model/metadata_keys.h"
#include "platform/log.h"
#include "prefs/recording_context.h"
#include "record/agent_record.h"
#include "record/capture_delegate.h"
#include "record/engine_environment.h"
#include "record/preview_controller.h"
#include "record/recording_limits.h"

namespace lmx {
namespace {

std::shared_ptr<LMRRecordingContext> captureSettings(const AgentContext& context, const AgentRecord& session,
                                                     CaptureFramework& framework) {
  try {
    if (context.options.adhoc.get()) return newRecordingContextForAdHoc(framework);
    CaptureType type = CaptureType::audioAndVideo;
    if (session.recordedType() == kRecordingTypeAudio) type = CaptureType::audio;
    if (session.recordedType() == kRecordingTypeVideo) type = CaptureType::video;
    return newRecordingContextForDaemonWithRecordingType(framework, type);
  } catch (const PreferenceError& error) {
    LMPLogMessage(nullptr, kLogCritical, "Unable to load the recording context, exception = %s",
                  error.what());
    return nullptr;
  }
}

/// A conference day that was asked for must not end after the usual four hours. An ad-hoc recording ends when
/// its operator said.
std::uint32_t lengthLimit(const AgentContext& context, const LMRRecordingContext& settings,
                          const SharedDictionary& metadata) {
  if (settings.continuous.segmentLength != 0)
    return static_cast<std::uint32_t>(settings.continuous.segmentLength);
  const bool daemon = !context.options.adhoc.get();
  const auto asked = daemon ? lookUp(metadata, metadata_key::kMaxRecordingMinutes) : std::nullopt;
  return greatestLengthInMinutes(context.options.duration.get(), asked.value_or(""));
}

}  // namespace

int LXAgentRecordPrepareCaptureController(AgentContext& context, const SharedDictionary& metadata) {
  const auto session = context.record_context();
  const auto framework = engineEnvironment().framework;
  if (!session || !framework) return kRecordNotRunning;
  const auto settings = captureSettings(context, *session, *framework);
  if (!settings) return kRecordNotRunning;
  settings->outputPath = session->filename.get().value_or("");
  settings->maximumFrameRate =
      maximumFrameRateFrom(context.recording.recording_video_maximum_frame_rate.get());
  settings->maxDurationMinutes = lengthLimit(context, *settings, metadata);
  const auto controller = framework->newCaptureController();
  const auto delegate = std::make_shared<LMRCaptureDelegate>(controller.get());
  session->captureController.set(controller);
  session->captureControllerDelegate.set(delegate);
  controller->setDelegate(delegate);
  const auto preview = session->previewController.get();
  if (controller->prepareRecording(*settings, preview ? preview->controller().session() : nullptr)) {
    return kRecordSuccess;
  }
  const auto error = controller->lastError();
  LMPLogMessage(nullptr, kLogError, "The capture could not be prepared: %s",
                error ? error->message.c_str() : "no reason given");
  return kRecordNotRunning;
}

}  // namespace lmx
