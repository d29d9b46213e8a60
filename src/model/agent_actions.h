// What lower layers may ask of the agent: main-thread actions and the recording callbacks.
#pragma once
#include <cstdint>
#include <ctime>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/run_loop.h"
#include "support/dictionary.h"
#include "support/time_value.h"

namespace lmx {

class AgentRecord;

/// The kinds of control channel.
enum class ChannelKind {
  detached,  ///< no peer; runs a timed command whose own channel is gone
  tunnel,    ///< the tunnel to the server
  local,     ///< the local socket
  direct,    ///< the TCP port
};

/// Implemented by AgentMain. Capture actions run on the main thread only; other threads request them with
/// perform(). Callbacks may come from any thread.
class AgentActions {
 public:
  using Action = void (AgentActions::*)();

  virtual ~AgentActions() = default;

  /// Runs `action` on the main thread. With Wait::untilDone on the main thread itself it runs at once.
  /// @return false when the main loop has ended and the action will not run
  virtual bool perform(Action action, Wait wait) = 0;

  /// The same, unless by then a later START has been granted than that of `request`: a STOP that comes twice
  /// must not end the next lecture.
  /// @param request  AgentRecord::addressedRequest() when the command came in
  virtual bool performFor(const std::string& request, Action action, Wait wait) = 0;

  /// Starts the recording that a START asks for, on the main thread; waits for it. Any thread.
  /// @param properties  the parameters of the START
  /// @return a RecordError; kRecordInvalidType when the main loop has ended
  virtual int performStart(const SharedDictionary& properties) = 0;
  [[nodiscard]] virtual bool isMainThread() const = 0;

  // Actions, main thread only. Those with a result store it in the context's `status`.
  virtual void prepareCapture() = 0;
  virtual void startPreview() = 0;
  virtual void stopPreview() = 0;
  virtual void pauseCapture() = 0;
  virtual void resumeCapture() = 0;
  virtual void stopCapture() = 0;
  virtual void cancelCapture() = 0;
  /// Cancels the session's request with its capture, so that nothing is left of it.
  virtual void cancelRecording() = 0;
  virtual void stopRecording() = 0;
  virtual void setRecorderStatusToIdle() = 0;
  virtual void submitStoppedRecording() = 0;
  virtual void shutDownControl() = 0;
  virtual void shutDownControlBecauseDeviceFailed() = 0;

  /// A capture has ended (delegate report, any thread). Asks the main thread to submit the recording.
  /// @param controller  identifies the capture; the session may have moved on to another one
  virtual void captureDidComplete(const void* controller) = 0;
  /// A capture was cancelled (delegate report, any thread). The session becomes idle unless it has moved on
  /// to another capture.
  virtual void captureDidCancel(const void* controller) = 0;

  /// Schedules `entry` to run at `date` (seconds since 1970, wall clock) on the main thread, on the channel
  /// of that kind. Any thread.
  virtual void scheduleTimedCommand(SharedDictionary entry, std::time_t date, ChannelKind channel) = 0;

  /// Calls `changed` on the main thread whenever an IPv4 address of this machine comes or goes, for as long
  /// as the result lives. Call it, and destroy the result, on the main thread.
  /// @return null when the network can't be watched
  [[nodiscard]] virtual std::unique_ptr<RunLoop::Source> watchNetwork(std::function<void()> changed) = 0;

  // Callbacks of the engine, any thread. They do nothing once the context's `running` is NO.
  virtual void recordDidStartWithFile(const std::string& file, const SharedDictionary& metadata,
                                      std::optional<TimeValue> atTime) = 0;
  virtual void recordDidPauseWithFile(const std::string& file, const SharedDictionary& metadata,
                                      std::int64_t elapsedSeconds) = 0;
  virtual void recordDidResumeWithFile(const std::string& file, const SharedDictionary& metadata) = 0;
  virtual void recordRuntimeErrorCallback(int code) = 0;
  /// @param session  the session that recorded, or a copy of it; its type and request are read
  /// @param elapsedSeconds  whole seconds of media
  virtual void recordDidStopWithFile(const std::shared_ptr<AgentRecord>& session, const std::string& file,
                                     const SharedDictionary& metadata, std::optional<TimeValue> atTime,
                                     std::int64_t elapsedSeconds, std::optional<TimeValue> stoppedTime,
                                     bool canceled) = 0;
};

}  // namespace lmx
