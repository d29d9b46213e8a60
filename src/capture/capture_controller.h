// What the engine sees of one recording. Passes commands and marks on to the recorder.
#pragma once
#include <atomic>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_framework.h"
#include "capture/capture_recorder.h"

namespace lmx {

/// Marks and commands do nothing before the recording has been prepared.
class CaptureController : public LMRCaptureController,
                          public std::enable_shared_from_this<CaptureController> {
 public:
  void setDelegate(std::weak_ptr<CaptureControllerDelegate> delegate) override;
  bool prepareRecording(const LMRRecordingContext& settings,
                        std::shared_ptr<CaptureSession> session) override;
  bool startRecording() override;
  void stopRecording() override;
  void cancelRecording() override;
  void pauseRecording() override;
  void resumeRecording() override;
  void setStartWithUUID(const std::string& uuid) override;
  void setStopWithUUID(const std::string& uuid) override;
  void setStartWithUUID(const std::string& uuid, double atTime, SharedDictionary parameters) override;
  void setStopWithUUID(const std::string& uuid, double atTime) override;
  void cancelRequestWithUUID(const std::string& uuid) override;
  void submitRequestWithUUID(const std::string& uuid) override;
  void syncMarks() override;
  double elapsedTimeForRequestWithUUID(const std::string& uuid) override;
  std::int64_t elapsedTimeInMilliseconds() override;
  int recordingState() override;
  bool hasShutDown() override;
  std::optional<CaptureError> lastError() override;
  std::shared_ptr<CaptureSession> session() override;
  std::vector<double> audioAveragePowerLevels() override { return {}; }
  std::optional<CaptureError> processRequestWithUUID(const std::string& uuid,
                                                     const std::string& outputPath) override;
  Result<std::string, CaptureError> processRequestBeside(const std::string& uuid,
                                                         const std::string& outputPath) override;
  [[nodiscard]] bool requestQueued(const std::string& uuid) override;
  void requestHandedOver(const std::string& uuid) override;
  std::vector<RecoveredRecording> recoverAbandonedRequests() override;
  std::optional<std::string> deleteEarliestSegment() override { return std::nullopt; }

 private:
  [[nodiscard]] CaptureError nothingFor(const std::string& outputPath) const;
  bool refuse(const CaptureError& reason);
  void reportSound(const CaptureError* error);
  [[nodiscard]] std::shared_ptr<CaptureControllerDelegate> delegate() const;
  /// How the end of the capture is reported; holds the delegate.
  [[nodiscard]] CaptureRecorder::Report reportOfTheEnd();
  [[nodiscard]] std::shared_ptr<CaptureRecorder> recorder() const;
  [[nodiscard]] std::optional<CaptureError> refusal() const;

  std::atomic<bool> armed_{false};  ///< startRecording has been called, or the capture has been tagged
  mutable std::mutex mutex_;
  std::weak_ptr<CaptureControllerDelegate> delegate_;  // guarded by mutex_
  std::shared_ptr<CaptureRecorder> recorder_;          // guarded by mutex_: null until prepared
  std::optional<CaptureError> refusal_;                // guarded by mutex_: why it could not be prepared
  std::string repository_;                             // guarded by mutex_
};

}  // namespace lmx
