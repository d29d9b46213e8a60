// The capture framework on GStreamer.
#pragma once
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_framework.h"

namespace lmx {

/// Cheap to make: plug-ins are loaded by warmUp or by the first use. Listing devices blocks for some
/// milliseconds. Thread-safe.
class GstCaptureFramework : public CaptureFramework {
 public:
  std::optional<std::string> defaultVideoDevice() override;
  /// Nothing: cameras with a microphone of their own count as two devices; files and streams are never a
  /// default.
  std::optional<std::string> defaultMuxedDevice() override { return std::nullopt; }
  bool hasDevice(const std::string& uniqueID) override;
  PreferredAudio preferredAudioDevice(const std::string& videoDevice) override;
  bool canBeMicrophone(const std::string& audioDevice) override;
  bool hasMicrophone(const std::optional<std::string>& audioDevice) override;
  std::optional<LMRCompressionOptions> compressionOptions(MediaType media, RecordingQuality quality) override;

  std::shared_ptr<LMRCaptureController> newCaptureController() override;
  std::unique_ptr<LMRPreviewController> newPreviewController(
      std::shared_ptr<CaptureSession> session) override;

  std::shared_ptr<CaptureSession> openAhead(const std::string& camera) override;
  void warmUp() override;
  void waitUntilClosed(std::chrono::milliseconds limit) override;
  std::string deviceInformation(const PictureLimits& limits) override;
  std::vector<RecoveredRecording> recoverUnfinished(
      const std::string& repository, const std::function<bool(const std::string& request)>& known) override;
};

}  // namespace lmx
