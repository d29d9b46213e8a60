// A scripted capture controller and preview controller that record their calls.
#pragma once
#include <atomic>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "capture/api/capture_framework.h"
#include "tests/unit/doubles/journal.h"

namespace lmx::testing {

/// Records operations in the journal by name ("setStart", "pauseRecording"), and marks with their arguments.
/// Script the results before other threads use it.
class ScriptedCaptureController : public LMRCaptureController {
 public:
  struct Mark {
    std::string operation;  ///< "setStart", "setStop" or "cancelRequest"
    std::string uuid;
    std::optional<double> time;
    SharedDictionary parameters;
  };

  class Session : public CaptureSession {
   public:
    explicit Session(bool running) : running_(running) {}
    bool isRunning() const override { return running_; }
    bool isOpening() const override { return opening; }
    std::atomic<bool> opening{false};

   private:
    bool running_;
  };

  explicit ScriptedCaptureController(Journal& journal) : journal_(journal) {}

  bool prepare_succeeds = true;
  bool microphone_there = true;
  bool start_succeeds = true;
  std::atomic<int> state{0};
  std::atomic<bool> shut_down{false};
  std::atomic<std::int64_t> elapsed_milliseconds{0};
  double elapsed_of_request = 0;
  std::vector<double> power_levels;
  std::optional<CaptureError> error;
  std::function<std::optional<std::string>()> on_delete_segment;
  std::atomic<bool> devices_run{false};  ///< result of its session's isRunning()
  std::function<void()> on_sync_marks;
  std::function<void()> on_start_recording;  ///< called on the capture thread
  /// Replaces the result `error` of processRequest.
  std::function<std::optional<CaptureError>(const std::string& path)> on_process_request;

  [[nodiscard]] std::vector<Mark> marks() const {
    const std::lock_guard lock(mutex_);
    return marks_;
  }
  [[nodiscard]] std::optional<LMRRecordingContext> settings() const {
    const std::lock_guard lock(mutex_);
    return settings_;
  }
  [[nodiscard]] std::shared_ptr<CaptureControllerDelegate> delegate() const {
    const std::lock_guard lock(mutex_);
    return delegate_.lock();
  }

  void setDelegate(std::weak_ptr<CaptureControllerDelegate> delegate) override {
    const std::lock_guard lock(mutex_);
    delegate_ = std::move(delegate);
  }
  bool prepareRecording(const LMRRecordingContext& settings, std::shared_ptr<CaptureSession>) override {
    journal_.add("prepareRecording");
    if (const auto reports = delegate(); reports && !microphone_there)
      reports->lmrCaptureSoundLost({CaptureError::kDomain, kDeviceNotFound, "no microphone"});
    const std::lock_guard lock(mutex_);
    settings_ = settings;
    return prepare_succeeds;
  }
  bool startRecording() override {
    journal_.add("startRecording");
    if (on_start_recording) on_start_recording();
    return start_succeeds;
  }
  void stopRecording() override { journal_.add("controller stopRecording"); }
  void cancelRecording() override { journal_.add("cancelRecording"); }
  void pauseRecording() override { journal_.add("pauseRecording"); }
  void resumeRecording() override { journal_.add("resumeRecording"); }

  void setStartWithUUID(const std::string& uuid) override { mark({"setStart", uuid, std::nullopt, nullptr}); }
  void setStopWithUUID(const std::string& uuid) override { mark({"setStop", uuid, std::nullopt, nullptr}); }
  void setStartWithUUID(const std::string& uuid, double atTime, SharedDictionary parameters) override {
    mark({"setStart", uuid, atTime, std::move(parameters)});
  }
  void setStopWithUUID(const std::string& uuid, double atTime) override {
    mark({"setStop", uuid, atTime, nullptr});
  }
  void cancelRequestWithUUID(const std::string& uuid) override {
    mark({"cancelRequest", uuid, std::nullopt, nullptr});
  }

  void submitRequestWithUUID(const std::string& uuid) override {
    mark({"submitRequest", uuid, std::nullopt, nullptr});
  }
  void syncMarks() override {
    journal_.add("syncMarks");
    if (on_sync_marks) on_sync_marks();
  }
  double elapsedTimeForRequestWithUUID(const std::string&) override { return elapsed_of_request; }
  std::int64_t elapsedTimeInMilliseconds() override { return elapsed_milliseconds; }
  int recordingState() override { return state; }
  bool hasShutDown() override { return shut_down; }
  std::optional<CaptureError> lastError() override { return error; }
  std::shared_ptr<CaptureSession> session() override { return std::make_shared<Session>(devices_run.load()); }
  std::vector<double> audioAveragePowerLevels() override { return power_levels; }

  std::optional<CaptureError> processRequestWithUUID(const std::string& uuid,
                                                     const std::string& outputPath) override {
    journal_.add("processRequest " + uuid + " " + outputPath);
    return on_process_request ? on_process_request(outputPath) : error;
  }
  Result<std::string, CaptureError> processRequestBeside(const std::string& uuid,
                                                         const std::string& outputPath) override {
    journal_.add("processRequestBeside " + uuid + " " + outputPath);
    const auto failure = on_process_request ? on_process_request(outputPath) : error;
    if (failure) return *failure;
    return outputPath;
  }
  bool journal_can_be_written = true;
  bool requestQueued(const std::string& uuid) override {
    journal_.add("requestQueued " + uuid);
    return journal_can_be_written;
  }
  void requestHandedOver(const std::string& uuid) override { journal_.add("requestHandedOver " + uuid); }
  std::function<std::vector<RecoveredRecording>()> on_recover;
  std::vector<RecoveredRecording> recoverAbandonedRequests() override {
    return on_recover ? on_recover() : std::vector<RecoveredRecording>();
  }
  std::optional<std::string> deleteEarliestSegment() override {
    return on_delete_segment ? on_delete_segment() : std::nullopt;
  }

 private:
  void mark(Mark mark) {
    journal_.add(mark.operation);
    const std::lock_guard lock(mutex_);
    marks_.push_back(std::move(mark));
  }

  Journal& journal_;
  mutable std::mutex mutex_;
  std::vector<Mark> marks_;  // guarded by mutex_, as are the next two
  std::optional<LMRRecordingContext> settings_;
  std::weak_ptr<CaptureControllerDelegate> delegate_;
};

/// A camera that is present or absent.
class ScriptedPreviewController : public LMRPreviewController {
 public:
  bool attaches = true;
  std::string name = "Scripted camera";

  bool attachIOWithDevice(const std::string& device, CaptureError* error) override {
    if (!attaches && error != nullptr) *error = {CaptureError::kDomain, kDeviceNotFound, "no " + device};
    return attaches;
  }
  void addAudioDeviceWithID(const std::optional<std::string>&) override {}
  std::string videoDeviceLocalizedDisplayName() const override { return name; }
  void setDelegate(std::shared_ptr<LMRPreviewControllerDelegate> delegate) override {
    delegate_ = std::move(delegate);
  }
  std::shared_ptr<CaptureSession> session() const override { return nullptr; }
  void startPreview() override { running_ = true; }
  void stopPreview() override { running_ = false; }
  bool isPreviewRunning() const override { return running_; }

 private:
  std::shared_ptr<LMRPreviewControllerDelegate> delegate_;
  std::atomic<bool> running_{false};
};

}  // namespace lmx::testing
