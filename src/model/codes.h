// The numbers that the agent shows the world: recording types, recorder states, results, replies, exit
// statuses.
#pragma once
#include <cstdint>

namespace lmx {

/// What is recorded, as preferences, journals and documents number it.
enum RecordingTypeCode : std::int32_t {
  kRecordingTypeNone = 0,
  kRecordingTypeAudio = 1,
  kRecordingTypeAudioVideo = 2,
  kRecordingTypeVideo = 3,
  kRecordingTypeFile = 4,
};

/// The type of a recording with these media; at least one of them.
constexpr RecordingTypeCode recordingTypeOf(bool video, bool audio) {
  if (!video) return kRecordingTypeAudio;
  return audio ? kRecordingTypeAudioVideo : kRecordingTypeVideo;
}

/// What the recorder does, as STATUS tells it.
enum RecorderStatus : std::int32_t { kRecorderIdle = 0, kRecorderPaused = 1, kRecorderRecording = 2 };

/// What a capture does, as its controller tells it; any other value means neither.
enum CaptureState : std::int32_t { kCaptureIdle = 0, kCaptureRecording = 3, kCapturePaused = 4 };

/// Results of the recording engine: the answer to START, and the last error that STATUS tells.
enum RecordError : std::int32_t {
  kRecordSuccess = 0,
  kRecordInvalidType = 1,  ///< also: agent not running, no path, control-action mutex not available
  kRecordInvalidArguments = 2,
  kRecordNotRunning = 3,  ///< also: the framework refused to prepare
  kRecordNotIdle = 4,
  kRecordLockFailed = 6,
  kRecordCannotWrite = 8,
  kRecordNoInput = 9,
  kRecordAcceptedAtStop = 26,
  kRecordNoDiskSpace = 30,
};

/// Why a command was not carried out.
enum class CommandError {
  none,
  noSession,         ///< no context or no recording session
  missingParameter,  ///< also: a timed command that can't be scheduled
  notAuthenticated,  ///< the peer must authenticate first
  noSuchTimer,
  timerRevoked,  ///< the time of a revoked command has come
};

/// The number behind "cmdStatus=".
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

/// How the process comes to its end.
enum class ProcessEnd {
  orderly,
  internalError,    ///< the daemon could not start, or lost its camera
  usage,            ///< the command line can't be understood
  deviceLost,       ///< in ad-hoc mode
  software,         ///< an exception
  operatingSystem,  ///< a lock, the locale, the log, a child process
  cannotCreate,     ///< the preferences file can't be written
  protocol,         ///< a tool gave an answer that makes no sense
  misconfigured,    ///< the service has been disabled
};

/// The exit status (sysexits.h); the manual page lists them.
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

/// What the ad-hoc client asks of the daemon; any other value counts as a recording.
enum AdHocRequest : std::int32_t {
  kAdHocRecording = 0,
  kAdHocStatus = 1,
  kAdHocTimerList = 2,
  kAdHocTimerRevoke = 3,
};

}  // namespace lmx
