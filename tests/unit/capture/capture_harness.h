// Runs the capture framework on synthetic devices and reads back what it wrote.
#pragma once
#include <stdlib.h>
#include <unistd.h>

#include <atomic>
#include <condition_variable>
#include <filesystem>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "capture/capture_controller.h"
#include "platform/identifiers.h"

namespace lmx::testing {

/// Devices that deliver as fast as the machine can.
inline constexpr const char* kFastVideo = "test://video?size=160x90&speed=max";
inline constexpr const char* kFastAudio = "test://audio?speed=max";

/// A fresh directory that goes with the object.
class Folder {
 public:
  Folder() {
    std::string pattern = std::filesystem::temp_directory_path() / "lmx_capture_XXXXXX";
    path_ = mkdtemp(pattern.data());
  }
  ~Folder() { std::filesystem::remove_all(path_); }
  Folder(const Folder&) = delete;
  Folder& operator=(const Folder&) = delete;
  [[nodiscard]] std::string path() const { return path_; }
  [[nodiscard]] std::string file(const std::string& name) const { return path_ + "/" + name; }

 private:
  std::string path_;
};

/// Remembers the one report of a controller and lets a test wait for it.
class Reports : public CaptureControllerDelegate {
 public:
  enum class Kind { none, complete, cancel };
  enum class Sound { there, lost, back };
  void lmrCaptureSoundLost(const CaptureError& /*error*/) override { setSound(Sound::lost); }
  void lmrCaptureSoundBack() override { setSound(Sound::back); }
  bool waitForSound(Sound wanted, std::chrono::seconds limit = std::chrono::seconds(30)) {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, limit, [&] { return sound_ == wanted; });
  }
  void lmrCaptureDidComplete(const std::optional<CaptureError>& error) override {
    set(Kind::complete, error);
  }
  void lmrCaptureDidCancel(const std::optional<CaptureError>& error) override { set(Kind::cancel, error); }
  Kind wait(std::chrono::seconds limit = std::chrono::seconds(60)) {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, limit, [this] { return kind_ != Kind::none; });
    return kind_;
  }
  std::optional<CaptureError> error() {
    const std::lock_guard lock(mutex_);
    return error_;
  }
  int count() {
    const std::lock_guard lock(mutex_);
    return count_;
  }

 private:
  void set(Kind kind, const std::optional<CaptureError>& error) {
    const std::lock_guard lock(mutex_);
    kind_ = kind;
    error_ = error;
    ++count_;
    changed_.notify_all();
  }
  void setSound(Sound sound) {
    const std::lock_guard lock(mutex_);
    sound_ = sound;
    changed_.notify_all();
  }
  std::mutex mutex_;
  std::condition_variable changed_;
  Sound sound_ = Sound::there;
  Kind kind_ = Kind::none;
  std::optional<CaptureError> error_;
  int count_ = 0;
};

/// One capture into a folder.
struct Capture {
  explicit Capture(const Folder& repository, std::string video = "test://video?size=320x180",
                   std::string audio = "test://audio") {
    settings.uuid = newUUIDString();
    settings.captureTempDir = repository.path();
    settings.videoEnabled = !video.empty();
    settings.audioEnabled = !audio.empty();
    settings.captureType = video.empty()   ? CaptureType::audio
                           : audio.empty() ? CaptureType::video
                                           : CaptureType::audioAndVideo;
    if (!video.empty()) settings.videoDeviceID = video;
    if (!audio.empty()) settings.audioDeviceID = audio;
    settings.videoCompressionOptions = LMRCompressionOptions{.quality = RecordingQuality::good};
    settings.audioCompressionOptions = LMRCompressionOptions{.media = MediaType::audio};
    controller->setDelegate(reports);
  }
  bool prepare() { return controller->prepareRecording(settings, nullptr); }
  /// Wall-clock time of running time 0, once prepared.
  [[nodiscard]] double zero() const {
    return std::dynamic_pointer_cast<Source>(controller->session())->clock().wallOffset();
  }

  LMRRecordingContext settings;
  std::shared_ptr<Reports> reports = std::make_shared<Reports>();
  std::shared_ptr<CaptureController> controller = std::make_shared<CaptureController>();
};

inline SharedDictionary parametersFor(const std::string& uuid) {
  return std::make_shared<const Dictionary>(Dictionary{{"RecordingMetadata_RECORDING_UUID", uuid}});
}

}  // namespace lmx::testing
