// The recording session: settings, status, time marks and capture objects of the agent's one recorder.
#pragma once
#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>

#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "model/recording_settings.h"
#include "platform/run_loop.h"
#include "support/dictionary.h"
#include "support/recursive_mutex.h"
#include "support/shared_value.h"
#include "support/time_value.h"

namespace lmx {

class AgentActions;
class AgentContext;
class CaptureThread;
class LMRCaptureDelegate;
class MyLMRPreviewController;

/// Compression context of the video, read and written as a whole.
struct LXAgentRecordVideoContext {
  std::int32_t captureWidth = 0;
  std::int32_t captureHeight = 0;
  std::int32_t averageDataRate = 0;
  std::uint32_t videoMaxFrameRate = 0;
  std::uint32_t videoPixelDepth = 0;
  std::uint32_t videoDesiredFramesPerSecond = 0;
  std::uint32_t videoKeyFrameRate = 0;
};

/// Every accessor is thread-safe: values are copied in and out. A time that is not set is absent.
/// The statusAndTimingMutex makes several of them one step (prepare, stop and get-status hold it).
class AgentRecord : public RecordingSettings, public std::enable_shared_from_this<AgentRecord> {
 public:
  using Text = std::optional<std::string>;
  using Time = std::optional<TimeValue>;

  AgentRecord() = default;
  /// Runs cleanup.
  ~AgentRecord();
  AgentRecord(const AgentRecord&) = delete;
  AgentRecord& operator=(const AgentRecord&) = delete;

  LMX_SHARED_FIELD(Text, filename, setFilename)
  LMX_SHARED_FIELD(Time, elapsedTime, setElapsedTime)
  LMX_SHARED_FIELD(Time, launchTime, setLaunchTime)
  LMX_SHARED_FIELD(Time, startTime, setStartTime)
  LMX_SHARED_FIELD(Time, stopTime, setStopTime)
  LMX_SHARED_FIELD(Time, hardStopTime, setHardStopTime)
  LMX_SHARED_FIELD(Time, softStopTime, setSoftStopTime)
  LMX_SHARED_FIELD(Time, lastContact, setLastContact)
  LMX_SHARED_FIELD(SharedDictionary, metadata, setMetadata)
  LMX_SHARED_FIELD(LXAgentRecordVideoContext, sessions, setSessions)
  LMX_SHARED_FIELD(std::shared_ptr<MyLMRPreviewController>, previewController, setPreviewController)
  LMX_SHARED_FIELD(std::shared_ptr<LMRCaptureController>, captureController, setCaptureController)
  LMX_SHARED_FIELD(std::shared_ptr<LMRCaptureDelegate>, captureControllerDelegate,
                   setCaptureControllerDelegate)
  LMX_SHARED_FIELD(std::shared_ptr<CaptureThread>, captureThread, setCaptureThread)
  LMX_SHARED_FIELD(std::string, recording_uuid, setRecording_uuid)
  LMX_SHARED_FIELD(std::string, request_uuid, setRequest_uuid)
  /// The START parameters that came with request_uuid: what the finished recording is named and described by,
  /// even when a later START has replaced the context's properties meanwhile.
  LMX_SHARED_FIELD(SharedDictionary, request_properties, setRequest_properties)

 public:
  /// The type of the recording that was prepared last; the configured type may change under it. Falls back to
  /// the configured type before the first one.
  [[nodiscard]] std::int32_t recordedType() const {
    const std::int32_t type = recordedType_;
    return type == kRecordingTypeNone ? recordingType() : type;
  }
  void setRecordedType(std::int32_t v) { recordedType_ = v; }
  [[nodiscard]] std::int32_t status() const { return status_; }
  void setStatus(std::int32_t v) { status_ = v; }
  [[nodiscard]] std::int32_t error() const { return error_; }
  void setError(std::int32_t v) { error_ = v; }
  [[nodiscard]] std::int32_t delay() const { return delay_; }
  void setDelay(std::int32_t v) { delay_ = v; }
  [[nodiscard]] std::int32_t maxUnattendedRecordingMinutes() const { return maxUnattendedRecordingMinutes_; }
  void setMaxUnattendedRecordingMinutes(std::int32_t v) { maxUnattendedRecordingMinutes_ = v; }
  [[nodiscard]] std::uint32_t videoPercent() const { return videoPercent_; }
  void setVideoPercent(std::uint32_t v) { videoPercent_ = v; }
  [[nodiscard]] std::uint32_t videoWidth() const { return videoWidth_; }
  void setVideoWidth(std::uint32_t v) { videoWidth_ = v; }
  [[nodiscard]] std::uint32_t videoHeight() const { return videoHeight_; }
  void setVideoHeight(std::uint32_t v) { videoHeight_ = v; }
  [[nodiscard]] std::int32_t audioSampleRate() const { return audioSampleRate_; }
  void setAudioSampleRate(std::int32_t v) { audioSampleRate_ = v; }
  [[nodiscard]] std::int32_t audioChannelsNumber() const { return audioChannelsNumber_; }
  void setAudioChannelsNumber(std::int32_t v) { audioChannelsNumber_ = v; }
  [[nodiscard]] bool audioOnlyMode() const { return audioOnlyMode_; }
  void setAudioOnlyMode(bool v) { audioOnlyMode_ = v; }
  /// Whether the 15-second auto-shutoff timer of a capture thread is running for this session.
  [[nodiscard]] bool autoShutoffCheckTimer() const { return autoShutoffCheckTimer_; }
  void setAutoShutoffCheckTimer(bool v) { autoShutoffCheckTimer_ = v; }

  /// @return the lock's result, 0 when locked. Recursive.
  int lockStatusAndTimingMutex() { return statusAndTimingLock_.lock(); }
  int unlockStatusAndTimingMutex() { return statusAndTimingLock_.unlock(); }

  /// Stamps the last contact; while a recording is active or paused also moves the soft stop.
  void updateLastContact();
  /// Recomputes the soft stop: now plus the unattended minutes, or none when those are 0 or less.
  void updateSoftStopTime();
  /// Sets the hard stop `seconds` from now; 0 or less clears it.
  void setRecordHardStopTimeSeconds(std::int32_t seconds);
  /// Forgets deadlines that have passed: they would end a recording at its first check.
  void clearPassedDeadlines();
  /// Moves the deadlines along when the wall clock was set since the last call: they say how long a recording
  /// may last. @param offset  seconds that the wall clock is ahead of the time since the machine started
  void followWallClock(std::int64_t offset);
  /// When the recording began. The capture thread may not have stamped its start yet when a recording is
  /// stopped at once: then the time at which it was prepared.
  [[nodiscard]] Time beginning() const;
  /// Whether a deadline has passed (logged).
  bool shouldStopRecording();
  /// Stops the recording when a deadline has passed. Capture thread, every 15 seconds.
  void checkForAutoShutoffConditions();
  /// Ends the recording: marks the stop and waits for the main thread's stopRecording. Always 0.
  int doAutoShutoff();
  /// Total size of the movie's volume in MB (2^20 bytes); 0 when it can't be measured (logged).
  double totalDiskSpaceInMB();
  /// The directory whose volume is measured: that of the file name, else the recording repository.
  [[nodiscard]] std::string volumePath();

  /// A copy with own values, own (unlocked) mutexes and shared capture objects; no timer.
  [[nodiscard]] std::shared_ptr<AgentRecord> copy() const;
  /// Stops a running capture and lets go of everything. Runs once.
  void cleanup();

 private:
  std::atomic<std::int32_t> recordedType_{kRecordingTypeNone};
  std::atomic<std::int32_t> status_{0};
  std::atomic<std::int32_t> error_{0};
  std::atomic<std::int32_t> delay_{0};
  std::atomic<std::int32_t> maxUnattendedRecordingMinutes_{0};
  std::atomic<std::uint32_t> videoPercent_{0};
  std::atomic<std::uint32_t> videoWidth_{0};
  std::atomic<std::uint32_t> videoHeight_{0};
  std::atomic<std::int32_t> audioSampleRate_{0};
  std::atomic<std::int32_t> audioChannelsNumber_{0};
  std::atomic<bool> audioOnlyMode_{false};
  std::atomic<bool> autoShutoffCheckTimer_{false};
  std::atomic<bool> cleaned_up_{false};
  bool is_copy_ = false;
  std::mutex clock_mutex_;
  std::optional<std::int64_t> clock_offset_;  // guarded by clock_mutex_; that of the last followWallClock
  RecursiveMutex statusAndTimingLock_;
};

/// A new context with a new session.
std::shared_ptr<AgentContext> newAgentContext();

}  // namespace lmx
