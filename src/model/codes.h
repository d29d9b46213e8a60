// Numeric codes visible outside the agent: recording types, recorder states, results, replies, exit statuses.
#pragma once
#include <cstdint>

namespace lmx {

/// What is recorded, as numbered in preferences, journals and properties documents.
enum RecordingTypeCode : std::int32_t {
  kRecordingTypeNone = 0,
  kRecordingTypeAudio = 1,
  kRecordingTypeAudioVideo = 2,
  kRecordingTypeVideo = 3,
  kRecordingTypeFile = 4,
};

/// The recording type for these media, of which at least one must be present.
constexpr RecordingTypeCode recordingTypeOf(bool video, bool audio) {
  if (!video) return kRecordingTypeAudio;
  return audio ? kRecordingTypeAudioVideo : kRecordingTypeVideo;
}

/// The recorder's state, as STATUS reports it.
enum RecorderStatus : std::int32_t { kRecorderIdle = 0, kRecorderPaused = 1, kRecorderRecording = 2 };

/// A capture's state, as its controller reports it; any other value means neither.
enum CaptureState : std::int32_t { kCaptureIdle = 0, kCaptureRecording = 3, kCapturePaused = 4 };

/// Results of the recording engine: the reply to START, and the last error in STATUS.
enum RecordError : std::int32_t {
  kRecordSuccess = 0,
  kRecordInvalidType = 1,  ///< also: agent not running, no path, or the control-action mutex is not available
  kRecordInvalidArguments = 2,
  kRecordNotRunning = 3,  ///< also: the capture framework refused to prepare
  kRecordNotIdle = 4,
  kRecordLockFailed = 6,
  kRecordCannotWrite = 8,
  kRecordNoInput = 9,
  kRecordAcceptedAtStop = 26,
  kRecordNoDiskSpace = 30,
};

/// Why a command was not executed.
enum class CommandError {
  none,
  noSession,         ///< no context or no recording session
  missingParameter,  ///< also: a timed command that can't be scheduled
  notAuthenticated,  ///< the peer must authenticate first
  noSuchTimer,
  timerRevoked,  ///< the scheduled time of a revoked command has come
};

/// The number after "cmdStatus=".
constexpr std::int32_t replyCode(CommandError error) {
  switch (error) {
    case CommandError::none:
      return 0;
    case CommandError::noSession:
      return 1;
    case CommandError::missingParameter:
      return 31;
    case CommandError::notAuthenticated:
      return 36;
    case CommandError::noSuchTimer:
      return 37;
    case CommandError::timerRevoked:
      return 38;
  }
  return 1;
}

/// Why the process ends.
enum class ProcessEnd {
  orderly,
  internalError,    ///< the daemon could not start, or lost its camera
  usage,            ///< invalid command line
  deviceLost,       ///< device lost in ad-hoc mode
  software,         ///< an unexpected exception
  operatingSystem,  ///< failure of a lock, the locale, the log or a child process
  cannotCreate,     ///< the preferences file can't be written
  protocol,         ///< a tool gave an invalid answer
  misconfigured,    ///< the service has been disabled
};

/// The exit status (sysexits.h). The manual page lists them.
constexpr int exitStatus(ProcessEnd end) {
  switch (end) {
    case ProcessEnd::orderly:
      return 0;
    case ProcessEnd::internalError:
      return 1;
    case ProcessEnd::usage:
      return 64;
    case ProcessEnd::deviceLost:
      return 69;
    case ProcessEnd::software:
      return 70;
    case ProcessEnd::operatingSystem:
      return 71;
    case ProcessEnd::cannotCreate:
      return 73;
    case ProcessEnd::protocol:
      return 76;
    case ProcessEnd::misconfigured:
      return 78;
  }
  return 1;
}

/// What the ad-hoc client requests from the daemon. Any other value counts as a recording.
enum AdHocRequest : std::int32_t {
  kAdHocRecording = 0,
  kAdHocStatus = 1,
  kAdHocTimerList = 2,
  kAdHocTimerRevoke = 3,
};

}  // namespace lmx
