// Prepare, stop and report on the agent's one recording.
#include "record/engine.h"

#include <chrono>
#include <cstdlib>
#include <ctime>
#include <thread>

#include "platform/identifiers.h"
#include "platform/log.h"
#include "platform/run_loop.h"
#include "prefs/agent_preferences.h"
#include "record/capture_delegate.h"
#include "record/capture_thread.h"
#include "record/preview_controller.h"
#include "support/format.h"
#include "support/heap_ptr.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

SharedValue<EngineEnvironment>& environmentSlot() {
  static auto* slot =
      new SharedValue<EngineEnvironment>;  // reached by threads that outlive main: never destroyed
  return *slot;
}

void reportRuntimeError(int code) {
  if (AgentActions* actions = engineEnvironment().actions) actions->recordRuntimeErrorCallback(code);
}

/// What is to be recorded where; nothing when the movie path can't be formed.
struct MovieChoice {
  std::optional<std::string> path;
  bool audioOnly = false;
};

bool isAudioOnly(const SharedDictionary& metadata) {
  return lookUp(metadata, "RecordingMetadata_AUDIO_ONLY") == "true";
}

std::optional<MovieChoice> chooseMovie(AgentContext& context, AgentRecord& session,
                                       const SharedDictionary& metadata) {
  if (context.adhoc()) return MovieChoice{context.adhoc_output_file(), false};
  if (session.recordingType() == kRecordingTypeFile) return MovieChoice{context.input_file(), false};
  const auto repository = context.recording_repository_path();
  if (!repository) {
    LMPLogMessage(context.log_context(), kLogCritical, "Internal error occurred");
    return std::nullopt;
  }
  const std::string identifier = lookUp(metadata, "RecordingMetadata_RECORDING_UUID").value_or("test");
  const bool audioOnly = isAudioOnly(metadata);
  if (const auto minutes = lookUp(metadata, "RecordingMetadata_UNATTENDED_RECORDING_MINUTES")) {
    session.setMaxUnattendedRecordingMinutes(std::atoi(minutes->c_str()));
  }
  return MovieChoice{*repository + "/" + identifier + ".mov", audioOnly};
}

/// The session's status-and-timing mutex for a scope.
class StatusAndTimingLock {
 public:
  explicit StatusAndTimingLock(AgentRecord& session)
      : session_(session), locked_(session.lockStatusAndTimingMutex() == 0) {}
  ~StatusAndTimingLock() {
    if (locked_) session_.unlockStatusAndTimingMutex();
  }
  StatusAndTimingLock(const StatusAndTimingLock&) = delete;
  StatusAndTimingLock& operator=(const StatusAndTimingLock&) = delete;
  [[nodiscard]] bool locked() const { return locked_; }

 private:
  AgentRecord& session_;
  bool locked_;
};

void logPrepareFailure(AgentRecord& session, int result) {
  if (result == kRecordNoInput) {
    LMPLogMessage(nullptr, kLogCritical, "No input");
    return;
  }
  if (result == kRecordCannotWrite) {
    LMPLogMessage(nullptr, kLogError, "Could not write %s, errno = %i",
                  session.filename().value_or("").c_str(), errno);
  }
  LMPLogMessage(nullptr, kLogError, "_LXAgentRecordPrepareCaptureSync received error");
}

/// The type to record. Looked up once: the session's own may be put back by the end of an earlier capture.
std::int32_t wantedType(const AgentRecord& session, const SharedDictionary& metadata, bool adhoc) {
  const std::int32_t type = session.recordingType();
  const bool soundOnly = !adhoc && type != kRecordingTypeFile && isAudioOnly(metadata);
  return soundOnly ? kRecordingTypeAudio : type;
}

int prepareByType(AgentContext& context, AgentRecord& session, std::int32_t type) {
  if (session.status() != kRecorderIdle) {
    LMPLogMessage(nullptr, kLogError, "Unable to start, capture not idle");
    reportRuntimeError(kRecordNotIdle);
    return kRecordNotIdle;
  }
  session.setRecordedType(type);
  if (type == kRecordingTypeFile) return kRecordSuccess;
  if (type < kRecordingTypeAudio || type > kRecordingTypeFile) {
    reportRuntimeError(kRecordInvalidType);
    return kRecordInvalidType;
  }
  const int result = LXAgentRecordPrepareCaptureController(context);
  if (result != kRecordSuccess) logPrepareFailure(session, result);
  return result;
}

/// @return kRecordSuccess, or kRecordNotRunning when there is no thread to record with.
int beginCapture(AgentRecord& session, SharedDictionary metadata) {
  session.setLaunchTime(currentTime());
  session.setElapsedTime(TimeValue{});
  session.setStatus(kRecorderRecording);
  const auto controller =
      session.recordedType() == kRecordingTypeFile ? nullptr : session.captureController();
  if (controller) controller->setStartWithUUID(session.recording_uuid());
  session.setCaptureThread(CaptureThread::start(session.shared_from_this(), controller));
  if (!session.captureThread()) {
    if (controller) controller->cancelRecording();
    session.setStatus(kRecorderIdle);
    return kRecordNotRunning;
  }
  session.setMetadata(metadata);
  if (AgentActions* actions = engineEnvironment().actions) {
    actions->recordDidStartWithFile(session.filename().value_or(""), metadata, session.startTime());
  }
  session.setError(kRecordSuccess);
  return kRecordSuccess;
}

/// After a refused request for sound only the configured type counts again; a capture that is running has its
/// own.
void restoreType(const AgentContext& context, AgentRecord& session) {
  const auto name = context.recording_type();
  const int code = AgentPreferences::recTypeToCode(name ? name->c_str() : nullptr);
  if (code != kRecordingTypeNone) session.setRecordingType(code);
}

}  // namespace

void setEngineEnvironment(EngineEnvironment environment) { environmentSlot().set(std::move(environment)); }
EngineEnvironment engineEnvironment() { return environmentSlot().get(); }

int LXAgentRecordPrepareCapture(AgentContext& context, SharedDictionary metadata) {
  if (!context.running()) return kRecordInvalidType;
  const auto session = context.record_context();
  if (!session) return LXAgentRecordPrepareCaptureSync(context, std::nullopt, std::move(metadata));
  const auto movie = chooseMovie(context, *session, metadata);
  if (!movie) return kRecordInvalidType;
  if (context.lock_control_action_mutex() != 0) {
    LMPLogMessage(context.log_context(), kLogCritical, "Internal error occurred");
    return kRecordInvalidType;
  }
  const auto unlock = [](AgentContext* held) { held->unlock_control_action_mutex(); };
  const std::unique_ptr<AgentContext, decltype(unlock)> lock(&context, unlock);
  session->setAudioOnlyMode(movie->audioOnly);
  if (movie->audioOnly) session->setRecordingType(kRecordingTypeAudio);
  const int result = LXAgentRecordPrepareCaptureSync(context, movie->path, std::move(metadata));
  if (result != kRecordSuccess && movie->audioOnly) restoreType(context, *session);
  return result;
}

int LXAgentRecordPrepareCaptureSync(AgentContext& context, const std::optional<std::string>& path,
                                    SharedDictionary metadata) {
  const auto session = context.record_context();
  if (!session || !path) {
    LMPLogMessage(nullptr, kLogError, "Invalid Arguments in function LXAgentRecordPrepareCapture");
    return kRecordInvalidArguments;
  }
  const StatusAndTimingLock lock(*session);
  if (!lock.locked()) return kRecordLockFailed;
  if (session->status() == kRecorderIdle) session->setFilename(path);
  if (LXAgentRecordHasDiskSpace(session->diskSpaceCutoffInMB(), session->filename().value_or("")) == 0) {
    return kRecordNoDiskSpace;
  }
  session->setRecording_uuid(newUUIDString());
  int result = prepareByType(context, *session, wantedType(*session, metadata, context.adhoc()));
  if (result == kRecordSuccess) result = beginCapture(*session, std::move(metadata));
  if (result != kRecordSuccess) {
    session->setMetadata(nullptr);
    session->setError(result);
  }
  return result;
}

namespace {

std::shared_ptr<LMRRecordingContext> captureSettings(AgentContext& context, const AgentRecord& session) {
  const auto framework = engineEnvironment().framework;
  try {
    if (context.adhoc()) return AgentPreferences::newRecordingContextForAdHoc(framework);
    CaptureType type = CaptureType::audioAndVideo;
    if (session.recordedType() == kRecordingTypeAudio) type = CaptureType::audio;
    if (session.recordedType() == kRecordingTypeVideo) type = CaptureType::video;
    return AgentPreferences(framework).newRecordingContextForDaemonWithRecordingType(type);
  } catch (const PreferenceError& error) {
    LMPLogMessage(nullptr, kLogCritical, "Unable to load the recording context, exception = %s",
                  error.what());
    return nullptr;
  }
}

double frameRateSetting(const AgentContext& context) {
  const auto text = context.recording_video_maximum_frame_rate();
  const double rate = text ? std::strtod(text->c_str(), nullptr) : 0;
  return rate >= 1 && rate <= 240 ? rate : 30.0;
}

}  // namespace

int LXAgentRecordPrepareCaptureController(AgentContext& context) {
  const auto session = context.record_context();
  const auto framework = engineEnvironment().framework;
  if (!session || !framework) return kRecordNotRunning;
  const auto settings = captureSettings(context, *session);
  if (!settings) return kRecordNotRunning;
  settings->outputPath = session->filename().value_or("");
  settings->maximumFrameRate = frameRateSetting(context);
  if (settings->continuous.segmentLength != 0) {
    settings->maxDurationMinutes = static_cast<std::uint32_t>(settings->continuous.segmentLength);
  } else if (context.duration() >= 1) {
    settings->maxDurationMinutes = static_cast<std::uint32_t>(context.duration());
  }
  const auto controller = framework->newCaptureController();
  const auto delegate = std::make_shared<LMRCaptureDelegate>(controller.get());
  session->setCaptureController(controller);
  session->setCaptureControllerDelegate(delegate);
  controller->setDelegate(delegate);
  const auto preview = session->previewController();
  if (controller->prepareRecording(*settings, preview ? preview->controller().session() : nullptr)) {
    return kRecordSuccess;
  }
  const auto error = controller->lastError();
  LMPLogMessage(nullptr, kLogError, "The capture could not be prepared: %s",
                error ? error->message.c_str() : "no reason given");
  return kRecordNotRunning;
}

namespace {

/// Waits until the controller has shut down, at most until `deadline`.
void waitForShutDown(const std::shared_ptr<LMRCaptureController>& controller,
                     std::chrono::steady_clock::time_point deadline) {
  while (controller && !controller->hasShutDown() && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(20ms);
  }
}

/// Stops a capture of the framework through the main thread. @return the agent's result.
int stopFrameworkCapture(AgentRecord& session, const std::shared_ptr<LMRCaptureController>& controller) {
  const EngineEnvironment environment = engineEnvironment();
  const auto deadline = std::chrono::steady_clock::now() + 10s;
  int result = kRecordSuccess;
  if (environment.context && environment.context->adhoc()) {
    if (controller) controller->stopRecording();
  } else {
    if (environment.actions != nullptr) environment.actions->perform(&AgentActions::stopCapture, Wait::no);
    while (session.status() != kRecorderIdle && std::chrono::steady_clock::now() < deadline) {
      std::this_thread::sleep_for(50ms);
    }
    result = environment.context ? environment.context->status() : kRecordInvalidType;
  }
  waitForShutDown(controller, deadline);
  return result;
}

int stopByType(AgentRecord& session, const std::shared_ptr<LMRCaptureController>& controller) {
  if (session.status() != kRecorderRecording && session.status() != kRecorderPaused) {
    LMPLogMessage(nullptr, kLogError, "Unable to stop, capture not running");
    reportRuntimeError(kRecordNotRunning);
    return kRecordNotRunning;
  }
  if (const auto thread = session.captureThread()) {
    thread->cancel();
    session.setCaptureThread(nullptr);
  }
  const std::int32_t type = session.recordedType();
  if (type == kRecordingTypeFile) return kRecordSuccess;
  if (type < kRecordingTypeAudio || type > kRecordingTypeFile) {
    reportRuntimeError(kRecordInvalidType);
    return kRecordInvalidType;
  }
  const int result = stopFrameworkCapture(session, controller);
  if (result != kRecordSuccess && result != kRecordAcceptedAtStop) {
    LMPLogMessage(nullptr, kLogError, "_LXAgentRecordStopCaptureSync received error");
  }
  return result;
}

/// Stop time now, elapsed time longer by the span since the start, status idle.
void closeTimes(AgentRecord& session) {
  const auto now = currentTime();
  session.setStopTime(now);
  const auto start = session.startTime();
  if (now && start) {
    const heap_ptr<TimeValue> span(LXAgentTimevalSubtract(&*now, &*start));
    const TimeValue before = session.elapsedTime().value_or(TimeValue{});
    const heap_ptr<TimeValue> sum(span ? LXAgentTimevalAdd(&before, span.get()) : nullptr);
    if (sum) session.setElapsedTime(*sum);
  }
  session.setStatus(kRecorderIdle);
}

}  // namespace

int LXAgentRecordStopCapture(const std::shared_ptr<AgentRecord>& session) {
  if (!session) {
    LMPLogMessage(nullptr, kLogError, "Invalid Arguments in function LXAgentRecordStopCapture");
    return kRecordInvalidArguments;
  }
  const auto controller = session->captureController();
  double elapsed = 0;
  if (controller) {
    controller->setStopWithUUID(session->recording_uuid());
    elapsed = controller->elapsedTimeForRequestWithUUID(session->recording_uuid());
  }
  const int result = stopByType(*session, controller);
  if (result == kRecordSuccess || result == kRecordAcceptedAtStop) closeTimes(*session);

  const StatusAndTimingLock lock(*session);
  if (!lock.locked()) return kRecordLockFailed;
  if (result != kRecordSuccess) {
    session->setError(result);
  } else if (AgentActions* actions = engineEnvironment().actions) {
    actions->recordDidStopWithFile(session, session->filename().value_or(""), session->metadata(),
                                   session->beginning(), static_cast<std::int64_t>(elapsed),
                                   session->stopTime(), false);
  }
  return result;
}

int LXAgentRecordGetStatus(const std::shared_ptr<AgentRecord>& session, RecordStatus* status) {
  if (!session) {
    LMPLogMessage(nullptr, kLogError, "Invalid Arguments in function LXAgentRecordGetStatus");
    return kRecordInvalidArguments;
  }
  const StatusAndTimingLock lock(*session);
  if (!lock.locked()) return kRecordLockFailed;
  if (status == nullptr) return kRecordSuccess;
  const auto controller = session->captureController();
  const int state = controller ? controller->recordingState() : 0;
  status->recordStatus = state == 3 ? kRecorderRecording : state == 4 ? kRecorderPaused : kRecorderIdle;
  status->elapsedSeconds = controller ? controller->elapsedTimeInMilliseconds() / 1000 : 0;
  const auto seconds = [](const AgentRecord::Time& time, std::int32_t& out) {
    if (time) out = static_cast<std::int32_t>(time->tv_sec);
  };
  seconds(session->launchTime(), status->start);
  seconds(session->stopTime(), status->stop);
  seconds(session->hardStopTime(), status->hardStop);
  status->lastError = session->error();
  status->availableDiskMB = static_cast<double>(LXAgentRecordAvailableDiskMegabytes(session));
  status->totalDiskMB = LXAgentRecordTotalDiskMegabytes(session);
  return kRecordSuccess;
}

std::shared_ptr<MyLMRPreviewController> LXAgentRecordCreatePreviewController(
    const std::optional<std::string>& videoDevice, const std::optional<std::string>& audioDevice,
    bool addAudio, std::int64_t intervalMilliseconds, std::shared_ptr<CaptureSession> session) {
  const auto framework = engineEnvironment().framework;
  if (!framework) return nullptr;
  auto preview =
      std::make_shared<MyLMRPreviewController>(framework->newPreviewController(std::move(session)));
  CaptureError error;
  if (!videoDevice || !preview->controller().attachIOWithDevice(*videoDevice, &error)) {
    if (!videoDevice) error = {CaptureError::kDomain, kDeviceNotFound, "no video device"};
    LMPLogMessage(nullptr, kLogNotice, "An error occurred while initializing the capture device: %s %d, %s",
                  error.domain.c_str(), error.code, error.message.c_str());
    return nullptr;
  }
  LMPLogMessage(nullptr, kLogDebug, "Using Video Device Named: %s",
                preview->controller().videoDeviceLocalizedDisplayName().c_str());
  if (addAudio) preview->controller().addAudioDeviceWithID(audioDevice);
  preview->setDelegate(std::make_shared<MyLMRPreviewControllerDelegate>(intervalMilliseconds));
  return preview;
}

std::optional<TimeValue> shiftedNow(const AgentContext& context) {
  auto now = currentTime();
  if (now) now->tv_sec -= context.timeshift_seconds();
  return now;
}

}  // namespace lmx
