// A capture framework that hands out scripted controllers.
#pragma once
#include <cmath>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "capture/api/capture_framework.h"
#include "tests/unit/doubles/scripted_capture.h"

namespace lmx::testing {

/// Has the devices "camera" and "microphone". Thread-safe, except for the scripts: set them first.
class ScriptedFramework : public CaptureFramework {
 public:
  explicit ScriptedFramework(Journal& journal) : journal_(journal) {}

  bool microphone_well_formed = true;
  bool microphone_there = true;
  bool cameras_attach = true;
  /// Prepares a new controller before the engine gets it.
  std::function<void(ScriptedCaptureController&)> on_new_controller;

  [[nodiscard]] std::size_t controllersMade() const {
    const std::lock_guard lock(mutex_);
    return controllers_.size();
  }
  /// The n-th controller handed out; null when it has been released.
  [[nodiscard]] std::shared_ptr<ScriptedCaptureController> controller(std::size_t n) const {
    const std::lock_guard lock(mutex_);
    return n < controllers_.size() ? controllers_[n].lock() : nullptr;
  }
  /// Whether every controller has been released, so that no thread or work item can still use one.
  [[nodiscard]] bool allReleased() const {
    const std::lock_guard lock(mutex_);
    for (const auto& made : controllers_) {
      if (!made.expired()) return false;
    }
    return true;
  }

  std::shared_ptr<LMRCaptureController> newCaptureController() override {
    auto made = std::make_shared<ScriptedCaptureController>(journal_);
    if (on_new_controller) on_new_controller(*made);
    const std::lock_guard lock(mutex_);
    controllers_.push_back(made);
    return made;
  }
  /// What openAhead returns, and what the last preview was made with.
  std::shared_ptr<CaptureSession> camera_ahead;
  std::shared_ptr<CaptureSession> preview_session;
  std::shared_ptr<CaptureSession> openAhead(const std::string& camera) override {
    journal_.add("openAhead " + camera);
    return camera_ahead;
  }
  std::unique_ptr<LMRPreviewController> newPreviewController(
      std::shared_ptr<CaptureSession> session) override {
    preview_session = std::move(session);
    auto made = std::make_unique<ScriptedPreviewController>();
    made->attaches = cameras_attach;
    return made;
  }
  void warmUp() override { journal_.add("warmUp"); }
  std::string deviceInformation(const PictureLimits& limits) override {
    return "camera up to " + std::to_string(limits.size.width) + " at " +
           std::to_string(std::lround(limits.rate)) + ", microphone\n";
  }
  std::vector<RecoveredRecording> unfinished;
  std::vector<RecoveredRecording> recoverUnfinished(
      const std::string&, const std::function<bool(const std::string&)>& known) override {
    std::vector<RecoveredRecording> unknown;
    for (const auto& recording : unfinished) {
      if (!known(recording.request)) unknown.push_back(recording);
    }
    return unknown;
  }

  std::optional<std::string> defaultVideoDevice() override { return "camera"; }
  std::optional<std::string> defaultMuxedDevice() override { return std::nullopt; }
  bool hasDevice(const std::string& uniqueID) override { return uniqueID == "camera"; }
  PreferredAudio preferredAudioDevice(const std::string&) override { return {"microphone", false}; }
  bool canBeMicrophone(const std::string&) override { return microphone_well_formed; }
  bool hasMicrophone(const std::optional<std::string>&) override { return microphone_there; }
  std::optional<LMRCompressionOptions> compressionOptions(MediaType media,
                                                          RecordingQuality quality) override {
    return LMRCompressionOptions{.media = media, .quality = quality};
  }

 private:
  Journal& journal_;
  mutable std::mutex mutex_;
  std::vector<std::weak_ptr<ScriptedCaptureController>> controllers_;  // guarded by mutex_
};

}  // namespace lmx::testing
