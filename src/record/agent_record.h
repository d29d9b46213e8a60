// The recording session: settings, status, time marks and capture objects of the agent's only recorder.
#pragma once
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "model/recording_request.h"
#include "model/recording_settings.h"
#include "record/stop_times.h"
#include "support/dictionary.h"
#include "support/recursive_mutex.h"
#include "support/shared_value.h"
#include "support/time_value.h"

namespace lmx {

class AgentContext;
class CaptureThread;
class LMRCaptureController;
class LMRCaptureDelegate;
class MyLMRPreviewController;

/// Every field is thread-safe: values are copied in and out. A time that is not set is absent. Hold the
/// statusAndTimingMutex to combine several accesses into one step (prepare, stop and get-status do).
class AgentRecord : public RecordingSettings, public std::enable_shared_from_this<AgentRecord> {
 public:
  using Text = std::optional<std::string>;
  using Time = std::optional<TimeValue>;

  AgentRecord() = default;
  /// Runs cleanup.
  ~AgentRecord();
  AgentRecord(const AgentRecord&) = delete;
  AgentRecord& operator=(const AgentRecord&) = delete;

  // What is recorded.
  SharedValue<Text> filename;  ///< the movie, or the input file of a "File" recording
  SharedValue<std::string> recording_uuid;
  SharedValue<bool> audioOnlyMode;
  SharedValue<SharedDictionary> metadata;
  /// Pixels; not set anywhere yet.
  SharedValue<std::uint32_t> videoWidth;
  SharedValue<std::uint32_t> videoHeight;

  // Who requested it.
  /// The last START that was granted. It names and describes the finished recording even when a later START
  /// has replaced the agent's properties.
  SharedValue<RecordingRequest> request;
  SharedValue<std::string> preparing_request;  ///< identifies the START that is being prepared; empty: none
  /// The request that a command which comes in now is about: that of the START being prepared, else the last
  /// one that was granted; empty before the first.
  [[nodiscard]] std::string addressedRequest() const;

  // Its progress.
  SharedValue<std::int32_t> status{kRecorderIdle};
  SharedValue<std::int32_t> error{kRecordSuccess};
  SharedValue<Time> launchTime;  ///< when it was prepared
  SharedValue<Time> startTime;   ///< when the capture thread started it
  SharedValue<Time> stopTime;
  SharedValue<Time> elapsedTime;
  SharedValue<Time> lastContact;  ///< from a server or a client
  StopTimes stop_times;
  /// Whether a capture thread's 15-second auto-shutoff timer runs for this session.
  SharedValue<bool> autoShutoffCheckTimer;

  // The objects that record.
  SharedValue<std::shared_ptr<MyLMRPreviewController>> previewController;
  SharedValue<std::shared_ptr<LMRCaptureController>> captureController;
  SharedValue<std::shared_ptr<LMRCaptureDelegate>> captureControllerDelegate;
  SharedValue<std::shared_ptr<CaptureThread>> captureThread;

  /// The type of the recording prepared last, since the configured type may have changed. Before the first
  /// recording, the configured type.
  [[nodiscard]] std::int32_t recordedType() const;
  void setRecordedType(std::int32_t type) { recordedType_.set(type); }

  /// @return the lock's result; 0 when locked. Recursive.
  int lockStatusAndTimingMutex() { return statusAndTimingLock_.lock(); }
  int unlockStatusAndTimingMutex() { return statusAndTimingLock_.unlock(); }

  /// Sets the time of the last contact. While a recording is active or paused this also moves the soft stop.
  void updateLastContact();
  /// When the recording began. If it was stopped before the capture thread set the start time, this is the
  /// time at which it was prepared.
  [[nodiscard]] Time beginning() const;

  /// A copy with its own values and its own unlocked mutexes, but shared capture objects. It has no timer.
  [[nodiscard]] std::shared_ptr<AgentRecord> copy() const;
  /// Lets go of the capture objects, of a copy that only describes the recording.
  void releaseCapture();
  /// Stops a running capture and releases everything. Takes effect once.
  void cleanup();

 private:
  SharedValue<std::int32_t> recordedType_{kRecordingTypeNone};
  SharedValue<bool> cleaned_up_;
  bool is_copy_ = false;
  RecursiveMutex statusAndTimingLock_;
};

/// Creates a context with a new session.
std::shared_ptr<AgentContext> newAgentContext();

}  // namespace lmx
