// The actions that control the capture.
#pragma once
#include <memory>

#include "agent/submission.h"
#include "capture/api/capture_framework.h"
#include "model/agent_context.h"
#include "record/agent_record.h"

namespace lmx {

/// Main thread only, except the recording callbacks and setRecorderStatusToIdle. Actions with a result store
/// it in the agent's `status`.
class CaptureActions {
 public:
  /// Both outlive the object.
  CaptureActions(AgentContext& context, Submission& submission)
      : context_(context), submission_(submission) {}

  /// @return a RecordError
  int prepareCapture();
  /// What a START asks for: prepares a capture with `properties` (its parameters, never null) and begins its
  /// request. In continuous mode the request begins in the capture that runs. While a recording runs it is
  /// refused and changes nothing.
  /// @return a RecordError
  int startRecording(const SharedDictionary& properties);
  void startPreview();
  void stopPreview();
  void pauseCapture();
  void resumeCapture();
  void stopCapture();
  void cancelCapture();
  /// Cancels the session's request, which may not have been known when the command came in, and its capture.
  void cancelRecording();
  void stopRecording();
  void setRecorderStatusToIdle();
  /// Handles SIGUSR1 and SIGUSR2. In ad-hoc mode this only marks the recording.
  void pauseOrResume(bool pause);

  /// The session's capture; null when there is none.
  [[nodiscard]] std::shared_ptr<LMRCaptureController> captureController() const;

  // The recording callbacks, each of which logs one line. Any thread.
  void recordDidStartWithFile(const std::string& file) const;
  void recordDidPauseWithFile(const std::string& file, std::int64_t elapsedSeconds) const;
  void recordDidResumeWithFile(const std::string& file) const;
  void recordRuntimeErrorCallback(int code) const;

 private:
  void configure(AgentRecord& record, const Dictionary& properties);
  static SharedDictionary withSubmitter(const RecordingRequest& request);
  void beginRequest(AgentRecord& record, const std::string& uuid, const SharedDictionary& properties);
  void resumeCaptureAndRequest();
  void setPreviewRunning(bool run);
  void stopOrCancelCapture(bool cancel);
  void stopOrCancelAdHoc(bool cancel);
  [[nodiscard]] double shiftedReferenceTime() const;
  [[nodiscard]] std::shared_ptr<AgentRecord> session() const { return context_.record_context(); }

  AgentContext& context_;
  Submission& submission_;
};

}  // namespace lmx
