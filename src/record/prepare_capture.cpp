// Decides what to record and where, and starts the recording.
#include "record/prepare_capture.h"

#include <cerrno>
#include <mutex>

#include "model/codes.h"
#include "model/metadata_keys.h"
#include "platform/identifiers.h"
#include "platform/log.h"
#include "prefs/recording_types.h"
#include "record/agent_record.h"
#include "record/capture_delegate.h"
#include "record/capture_set_up.h"
#include "record/capture_thread.h"
#include "record/disk_space.h"
#include "record/engine_environment.h"
#include "record/recording_limits.h"
#include "record/status_lock.h"

namespace lmx {
namespace {

/// The movie's path and whether only audio is recorded.
struct MovieChoice {
  std::optional<std::string> path;
  bool audioOnly = false;
};

bool isAudioOnly(const SharedDictionary& metadata) {
  return lookUp(metadata, metadata_key::kAudioOnly) == "true";
}

std::optional<MovieChoice> chooseMovie(AgentContext& context, AgentRecord& session,
                                       const SharedDictionary& metadata) {
  if (context.options.adhoc.get()) return MovieChoice{context.options.adhoc_output_file.get(), false};
  if (session.recordingType.get() == kRecordingTypeFile)
    return MovieChoice{context.recording.input_file.get(), false};
  const auto repository = context.recording.recording_repository_path.get();
  if (!repository) {
    LMPLogMessage(context.log_context(), kLogCritical, "Internal error occurred");
    return std::nullopt;
  }
  const std::string identifier = lookUp(metadata, metadata_key::kRecordingUUID).value_or("test");
  const bool audioOnly = isAudioOnly(metadata);
  if (metadata) configureUnattendedLimit(*metadata, session.stop_times);
  return MovieChoice{*repository + "/" + identifier + ".mov", audioOnly};
}

void logPrepareFailure(AgentRecord& session, int result) {
  if (result == kRecordNoInput) {
    LMPLogMessage(nullptr, kLogCritical, "No input");
    return;
  }
  if (result == kRecordCannotWrite) {
    LMPLogMessage(nullptr, kLogError, "Could not write %s, errno = %i",
                  session.filename.get().value_or("").c_str(), errno);
  }
  LMPLogMessage(nullptr, kLogError, "_LXAgentRecordPrepareCaptureSync received error");
}

/// The type to record. Determined once, because the end of an earlier capture may reset the session's type.
std::int32_t wantedType(const AgentRecord& session, const SharedDictionary& metadata, bool adhoc) {
  const std::int32_t type = session.recordingType.get();
  const bool soundOnly = !adhoc && type != kRecordingTypeFile && isAudioOnly(metadata);
  return soundOnly ? kRecordingTypeAudio : type;
}

/// The answer while a recording runs, of which nothing changes. The status lock is held.
int refuseSecondRecording(AgentRecord& session) {
  if (LXAgentRecordHasDiskSpace(session.diskSpaceCutoffInMB.get(), session.filename.get().value_or("")) ==
      0) {
    return kRecordNoDiskSpace;
  }
  session.recording_uuid.set(newUUIDString());
  LMPLogMessage(nullptr, kLogError, "Unable to start, capture not idle");
  reportRuntimeError(kRecordNotIdle);
  session.error.set(kRecordNotIdle);
  return kRecordNotIdle;
}

int prepareByType(AgentContext& context, AgentRecord& session, std::int32_t type,
                  const SharedDictionary& metadata) {
  session.setRecordedType(type);
  if (type == kRecordingTypeFile) return kRecordSuccess;
  if (type < kRecordingTypeAudio || type > kRecordingTypeFile) {
    reportRuntimeError(kRecordInvalidType);
    return kRecordInvalidType;
  }
  const int result = LXAgentRecordPrepareCaptureController(context, metadata);
  if (result != kRecordSuccess) logPrepareFailure(session, result);
  return result;
}

/// @return kRecordSuccess, or kRecordNotRunning when no capture thread could be started
int beginCapture(AgentRecord& session, SharedDictionary metadata) {
  session.launchTime.set(lmp_gettimeofday());
  session.elapsedTime.set(TimeValue{});
  session.status.set(kRecorderRecording);
  const auto controller =
      session.recordedType() == kRecordingTypeFile ? nullptr : session.captureController.get();
  if (controller) controller->setStartWithUUID(session.recording_uuid.get());
  session.captureThread.set(CaptureThread::start(session.shared_from_this(), controller));
  if (!session.captureThread.get()) {
    if (controller) controller->cancelRecording();
    session.status.set(kRecorderIdle);
    return kRecordNotRunning;
  }
  session.metadata.set(metadata);
  if (AgentActions* actions = engineEnvironment().actions) {
    actions->recordDidStartWithFile(session.filename.get().value_or(""), metadata, session.startTime.get());
  }
  const auto delegate = controller ? session.captureControllerDelegate.get() : nullptr;
  delegate ? delegate->startHasSucceeded(session) : session.error.set(kRecordSuccess);
  return kRecordSuccess;
}

/// Restores the configured type after a refused audio-only request. A running capture keeps its own type.
void restoreType(const AgentContext& context, AgentRecord& session) {
  const RecordingTypeCode code = recTypeToCode(context.recording.recording_type.get());
  if (code != kRecordingTypeNone) session.recordingType.set(code);
}

}  // namespace

std::optional<int> LXAgentRecordRefusal(AgentRecord& session) {
  const StatusAndTimingLock lock(session);
  if (!lock.locked()) return kRecordLockFailed;
  if (session.status.get() == kRecorderIdle) return std::nullopt;
  return refuseSecondRecording(session);
}

int LXAgentRecordPrepareCapture(AgentContext& context, SharedDictionary metadata) {
  if (!context.state.running.get()) return kRecordInvalidType;
  const auto session = context.record_context();
  if (!session) return LXAgentRecordPrepareCaptureSync(context, std::nullopt, std::move(metadata));
  if (const auto refusal = LXAgentRecordRefusal(*session)) return *refusal;
  const auto movie = chooseMovie(context, *session, metadata);
  if (!movie) return kRecordInvalidType;
  if (context.control_action_mutex.lock() != 0) {
    LMPLogMessage(context.log_context(), kLogCritical, "Internal error occurred");
    return kRecordInvalidType;
  }
  const std::unique_lock held(context.control_action_mutex, std::adopt_lock);
  session->audioOnlyMode.set(movie->audioOnly);
  if (movie->audioOnly) session->recordingType.set(kRecordingTypeAudio);
  const int result = LXAgentRecordPrepareCaptureSync(context, movie->path, std::move(metadata));
  if (result != kRecordSuccess && movie->audioOnly) restoreType(context, *session);
  return result;
}

int LXAgentRecordPrepareCaptureSync(AgentContext& context, const std::optional<std::string>& path,
                                    SharedDictionary metadata) {
  const auto session = context.record_context();
  if (!session || !path) return invalidArguments("LXAgentRecordPrepareCapture");
  const StatusAndTimingLock lock(*session);
  if (!lock.locked()) return kRecordLockFailed;
  if (session->status.get() != kRecorderIdle) return refuseSecondRecording(*session);
  session->filename.set(path);
  if (LXAgentRecordHasDiskSpace(session->diskSpaceCutoffInMB.get(), session->filename.get().value_or("")) ==
      0) {
    return kRecordNoDiskSpace;
  }
  session->recording_uuid.set(newUUIDString());
  const std::int32_t type = wantedType(*session, metadata, context.options.adhoc.get());
  int result = prepareByType(context, *session, type, metadata);
  if (result == kRecordSuccess) result = beginCapture(*session, std::move(metadata));
  if (result != kRecordSuccess) {
    session->metadata.set(nullptr);
    session->error.set(result);
  }
  return result;
}

}  // namespace lmx
