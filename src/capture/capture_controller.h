// One recording: raw media in, marks and commands beside it, a growing movie out.
#pragma once
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "capture/api/capture_framework.h"
#include "capture/gst/encoder.h"
#include "capture/media/request_marks.h"
#include "capture/media/span_cutter.h"
#include "capture/source/capture_pipeline.h"
#include "capture/store/finished_capture.h"
#include "capture/store/journal.h"
#include "capture/store/movie_writer.h"

namespace lmx {

/// Threads: the pipeline's streaming threads only queue; the recorder's own thread cuts and feeds the
/// encoder; the encoder's threads hand samples to the writer's thread. The recorder's thread keeps the
/// controller alive until the file is closed.
class CaptureController : public LMRCaptureController,
                          public CaptureConsumer,
                          public std::enable_shared_from_this<CaptureController> {
 public:
  /// @param defaultMicrophone  asked when the settings name no microphone
  explicit CaptureController(std::function<std::optional<std::string>()> defaultMicrophone)
      : default_microphone_(std::move(defaultMicrophone)) {}

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
  double elapsedTimeForRequestWithUUID(const std::string& uuid) override;
  std::int64_t elapsedTimeInMilliseconds() override;
  int recordingState() override;
  bool hasShutDown() override;
  std::optional<CaptureError> lastError() override;
  std::shared_ptr<CaptureSession> session() override;
  std::vector<double> audioAveragePowerLevels() override { return {}; }
  std::optional<CaptureError> processRequestWithUUID(const std::string& uuid,
                                                     const std::string& outputPath) override;
  void requestHandedOver(const std::string& uuid) override;
  std::vector<RecoveredRecording> recoverAbandonedRequests() override;
  std::optional<std::string> deleteEarliestSegment() override { return std::nullopt; }

  void onVideo(BufferHandle buffer, double runningTime) override;
  void onAudio(BufferHandle buffer, double runningTime) override;
  void onCaptureError(const CaptureError& error) override;

  /// For tests of hours of media: the pipeline, once prepared.
  [[nodiscard]] CapturePipeline::Lease pipeline();

 private:
  struct Item {
    BufferHandle buffer;
    double time = 0;
  };
  using Items = std::deque<Item>;
  enum class Ending { no, stop, cancel };

  // Preparing (main thread).
  bool fail(CaptureError error);
  bool openSource(const LMRRecordingContext& settings);
  bool openFiles(const LMRRecordingContext& settings);
  void describeMedia(const LMRRecordingContext& settings);

  // The recorder's thread.
  void run();
  void recordUntilTheEnd();
  bool takeItems(Items& video, Items& audio);
  [[nodiscard]] bool reachedEnd() const;
  void feedVideo(const Item& item);
  void feedSound(Items& audio);
  void feedVirtualFrames(double until);
  FrameDecision decide(double t);
  void cutChunk(const Item& chunk);
  void pushPieces(const Item& chunk, const std::vector<SoundPiece>& pieces);
  bool ensureEncoder();
  void checkLimits();
  void closeMedia();
  void finishCapture();
  void fatal(const CaptureError& error);
  void endNow(Ending how);
  [[nodiscard]] double chunkSeconds(const Item& item) const;

  const std::function<std::optional<std::string>()> default_microphone_;
  std::string repository_;
  std::string folder_;
  LMRRecordingContext settings_;
  bool has_video_ = false;
  bool has_audio_ = false;
  FrameRate frame_rate_;
  double frame_seconds_ = 0;  ///< of the movie's clock; 10 ms where there is only sound
  AudioEncoding audio_encoding_;
  std::optional<std::chrono::steady_clock::duration> max_duration_;

  // Recorder's thread only.
  std::optional<FrameCutter> frames_;
  std::optional<SoundCutter> sound_;
  std::unique_ptr<Encoder> encoder_;
  std::unique_ptr<MovieWriter> writer_;
  std::optional<GrowingMovie> movie_;
  Items pending_sound_;
  double last_frame_time_ = -1e300;
  std::uint32_t next_place_ = 0;
  std::optional<double> next_virtual_;

  std::mutex mutex_;
  std::condition_variable changed_;
  CapturePipeline::Lease pipeline_;                     // guarded by mutex_
  std::weak_ptr<CaptureControllerDelegate> delegate_;   // guarded by mutex_
  std::shared_ptr<Journal> journal_;                    // set while preparing, then constant
  RequestMarks marks_;                                  // guarded by mutex_
  std::string tag_uuid_;                                // guarded by mutex_
  Span tag_span_;                                       // guarded by mutex_
  Items video_queue_;                                   // guarded by mutex_
  Items audio_queue_;                                   // guarded by mutex_
  std::uint64_t dropped_ = 0;                           // guarded by mutex_
  Ending ending_ = Ending::no;                          // guarded by mutex_
  double end_time_ = 0;                                 // guarded by mutex_
  std::chrono::steady_clock::time_point end_deadline_;  // guarded by mutex_
  bool armed_ = false;                                  // guarded by mutex_
  bool shut_down_ = false;                              // guarded by mutex_
  double closed_at_ = 0;                       // guarded by mutex_: running time when the capture ended
  std::optional<CaptureError> error_;          // guarded by mutex_
  std::shared_ptr<FinishedCapture> finished_;  // guarded by mutex_
  std::atomic<double> video_horizon_{-1e300};
  std::atomic<std::uint32_t> recorded_frames_{0};
};

}  // namespace lmx
