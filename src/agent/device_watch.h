// The camera: whether it is there, and looking for it again.
#pragma once
#include <cstdint>
#include <functional>
#include <memory>

#include "agent/submission.h"
#include "capture/api/capture_framework.h"
#include "model/agent_context.h"

namespace lmx {

/// Main thread only.
class DeviceWatch {
 public:
  /// @param submission  outlives the object
  /// @param deviceIsBack  called when a missed camera has been found; false ends the agent
  DeviceWatch(std::shared_ptr<AgentContext> context, std::shared_ptr<CaptureFramework> framework,
              const Submission& submission, std::function<bool()> deviceIsBack)
      : context_(std::move(context)),
        framework_(std::move(framework)),
        submission_(submission),
        device_is_back_(std::move(deviceIsBack)) {}

  /// The capture settings that the preferences give now; null when they can't be used (logged).
  [[nodiscard]] std::shared_ptr<LMRRecordingContext> recordingContext() const;

  /// Looks whether the camera of `settings` can be opened; without it the agent stays offline for now.
  void probeDevice(const LMRRecordingContext& settings);
  [[nodiscard]] bool deviceIsOffline() const { return device_offline_; }
  /// Looks for a missed camera again, every eleven seconds. Ends the agent when it is still missing, after
  /// one warning if it failed in use.
  void retryDevice(std::int64_t now);
  /// The camera failed in use: its absence is worth a warning.
  void deviceFailed() { shouldDisplayOfflineMessage_ = true; }

  /// Whether the capture has lost its device, and the agent may end over it: a recording on its way to the
  /// server, also one that is not in the queue yet, is brought there first. An ad-hoc client waits for
  /// nothing.
  [[nodiscard]] bool deviceDisconnected() const;
  /// Says so. In ad-hoc mode ends the process (69), else waits two seconds.
  void announceLostDevice() const;

 private:
  [[nodiscard]] bool openAgain(const LMRRecordingContext& settings);

  const std::shared_ptr<AgentContext> context_;
  const std::shared_ptr<CaptureFramework> framework_;
  const Submission& submission_;
  const std::function<bool()> device_is_back_;
  bool shouldDisplayOfflineMessage_ = false;
  bool device_offline_ = false;
};

}  // namespace lmx
