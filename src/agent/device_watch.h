// Checks whether the camera is present, and looks for it when it is missing.
#pragma once
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>

#include "agent/submission.h"
#include "capture/api/capture_framework.h"
#include "model/agent_context.h"

namespace lmx {

/// Main thread only.
class DeviceWatch {
 public:
  /// @param submission  outlives the object
  /// @param deviceIsBack  called when a missing camera has been found; returning false ends the agent
  DeviceWatch(std::shared_ptr<AgentContext> context, std::shared_ptr<CaptureFramework> framework,
              const Submission& submission, std::function<bool()> deviceIsBack)
      : context_(std::move(context)),
        framework_(std::move(framework)),
        submission_(submission),
        device_is_back_(std::move(deviceIsBack)) {}

  /// The capture settings from the current preferences; null when they can't be used (logged).
  [[nodiscard]] std::shared_ptr<LMRRecordingContext> recordingContext() const;

  /// Begins to open the camera of `settings`, so that probeDevice need not wait for all of it.
  /// @return holds it open; null where there is none
  [[nodiscard]] std::shared_ptr<CaptureSession> openAhead(const LMRRecordingContext& settings) const;
  /// Checks whether the camera of `settings` can be opened. Without it the agent stays offline for now. A
  /// missing microphone is only told.
  /// @param ahead  the camera that is being opened already, or null
  void probeDevice(const LMRRecordingContext& settings, std::shared_ptr<CaptureSession> ahead);
  [[nodiscard]] bool deviceIsOffline() const { return device_offline_; }
  /// Looks for a missing camera every eleven seconds, but not during a recording: then as soon as that has
  /// ended. If it is still missing the agent ends, once nothing waits for its submission; after a failure in
  /// use there is one warning and another attempt first. Does not wait for a camera that takes its time: the
  /// next call looks again.
  void retryDevice(std::int64_t now);
  /// The camera failed in use, so its absence is worth a warning.
  void deviceFailed() { shouldDisplayOfflineMessage_ = true; }

  /// Whether the capture has lost its device and the agent may end because of it. Recordings that run, are
  /// queued or about to be are submitted first. An ad-hoc client does not wait.
  [[nodiscard]] bool deviceDisconnected() const;
  /// Logs the loss. Then ends the process (69) in ad-hoc mode, else waits two seconds.
  void announceLostDevice() const;

 private:
  void tellOfMissingMicrophone(const LMRRecordingContext& settings) const;
  void deviceFound();
  void giveUp();
  [[nodiscard]] bool openAgain(const LMRRecordingContext& settings, std::shared_ptr<CaptureSession> ahead);

  const std::shared_ptr<AgentContext> context_;
  const std::shared_ptr<CaptureFramework> framework_;
  const Submission& submission_;
  const std::function<bool()> device_is_back_;
  /// A look for the camera that has begun.
  struct Retry {
    std::shared_ptr<LMRRecordingContext> settings;
    std::shared_ptr<CaptureSession> camera;
  };
  std::optional<Retry> retry_;
  bool shouldDisplayOfflineMessage_ = false;
  bool device_offline_ = false;
};

}  // namespace lmx
