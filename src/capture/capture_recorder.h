// Records one capture: cuts raw media along the marks that arrive meanwhile and writes a growing movie.
#pragma once
#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "capture/api/capture_framework.h"
#include "capture/gst/picture_converter.h"
#include "capture/media/unreadable_pictures.h"
#include "capture/media_cutter.h"
#include "capture/media_queue.h"
#include "capture/movie_output.h"
#include "capture/recording_account.h"
#include "capture/recording_plan.h"
#include "capture/recording_sources.h"
#include "capture/store/capture_files.h"
#include "capture/store/capture_marks.h"
#include "capture/store/finished_capture.h"

namespace lmx {

/// Owns the capture's devices, files and recording thread from open() until the file is closed. Streaming
/// threads queue; the recording thread cuts and feeds the encoder; the encoder's threads hand samples to the
/// writer's thread. The recording thread keeps the recorder alive until it has ended. Thread-safe.
class CaptureRecorder : public CaptureConsumer, public std::enable_shared_from_this<CaptureRecorder> {
 public:
  using Ending = CaptureMarks::Ending;
  struct Outcome {
    bool cancelled = false;
    std::optional<CaptureError> error;
  };
  /// Told on the recording thread when the file is closed; the devices are about to be given back.
  using Report = std::function<void(const Outcome&)>;
  /// Told on a source's thread when the microphone is lost while the recording goes on, and when it is back
  /// (null).
  using SoundReport = std::function<void(const CaptureError* error)>;
  /// Asked for the report on the recording thread, just before the end of the capture can be seen.
  using Reporter = std::function<Report()>;

  /// Opens the devices and makes the capture's files. Blocks for as long as that takes.
  static Result<std::shared_ptr<CaptureRecorder>, CaptureError> open(const RecordingPlan& plan);
  /// Starts the recording thread; once. What `reporter` holds stays alive until the thread has ended.
  /// @return why the thread could not be started; nothing is recorded then, and the devices are given back
  [[nodiscard]] std::optional<CaptureError> run(Reporter reporter, SoundReport soundReport);

  /// Starts devices that wait for it ("speed=max"). All others deliver already.
  void startFlow();
  /// Decides that the recording ends; the recording thread does the rest. Only the first call counts.
  void end(Ending how);

  [[nodiscard]] CaptureMarks& marks() { return marks_; }
  /// Returns once all marks so far, and the names of the capture's files, survive a power cut (failures are
  /// logged).
  void syncMarks() const;
  /// Running time now; in a closed capture the time at which it ended.
  [[nodiscard]] double runningTime() const;
  /// Running time of a wall-clock time, seconds since 2001-01-01 UTC.
  [[nodiscard]] double runningTimeAt(double wallTime) const;
  /// Media written so far.
  [[nodiscard]] std::int64_t recordedMilliseconds() const;
  [[nodiscard]] std::optional<CaptureError> error() const;
  /// The open devices; null once they have been given back.
  [[nodiscard]] std::shared_ptr<CaptureSession> session() const;
  /// The closed capture; null while it records.
  [[nodiscard]] std::shared_ptr<FinishedCapture> finished() const;
  /// Waits until the capture is closed.
  [[nodiscard]] std::shared_ptr<FinishedCapture> waitUntilFinished() const;

  void onPicture(SampleHandle picture, double time) override;
  void onSound(BufferHandle sound, double time) override;
  void onSourceLost(SourceUse use, const CaptureError& error) override;
  void onSourceAway(SourceUse use, const CaptureError& error) override;
  void onSourceBack(SourceUse use, double seconds) override;

 private:
  CaptureRecorder(const RecordingPlan& plan, RecordingSources sources, CaptureFiles files);

  // The recording thread.
  void record(const Reporter& reporter);
  void guarded(const std::function<void()>& step);
  void recordUntilTheEnd();
  void feed(MediaQueue::Batch batch);
  void tickAccount();
  [[nodiscard]] bool reachedEnd() const;
  void checkLimits();
  std::uint32_t closeMovie();
  void publish(std::uint32_t totalFrames);
  [[nodiscard]] double endOfMedia() const;
  [[nodiscard]] BufferHandle convert(const RawMedium& frame);
  void noteReadable(double t, bool readable);

  // Any thread.
  [[nodiscard]] double timeNow() const;
  void fail(const CaptureError& error);
  void soundLost(const CaptureError& error);

  const RecordingPlan plan_;
  const MovieEncoding encoding_;
  const CaptureClock clock_;
  const double frame_seconds_;  ///< of the movie's clock
  const double wall_offset_;    ///< at the beginning
  const std::string folder_;
  const std::shared_ptr<Journal> journal_;
  CaptureMarks marks_;
  MediaQueue queue_;
  Deadline patience_;  // of all that the movie's threads wait for
  RecordingAccount account_;
  std::optional<PictureConverter> converter_;  // recording thread
  UnreadablePictures unreadable_;              // recording thread
  PictureSize camera_size_;                    // recording thread: as it was told
  double last_change_ = -1e300;                // recording thread: when the format changed, as it was told
  bool limit_reached_ = false;                 // recording thread
  std::atomic<bool> heard_{false};             ///< some sound has come
  std::atomic<bool> sound_away_{false};
  std::atomic<std::uint32_t> recorded_frames_{0};
  std::atomic<double> media_time_{0};  ///< running time that the leading device has reached

  mutable std::mutex mutex_;
  mutable std::condition_variable finished_set_;
  std::optional<RecordingSources> sources_;    // guarded by mutex_: nothing once the capture is closed
  SoundReport sound_report_;                   // guarded by mutex_: null once the capture is closed
  bool flowing_ = false;                       // guarded by mutex_: devices of "speed=max" have been started
  double closed_at_ = 0;                       // guarded by mutex_: running time when the capture ended
  std::optional<CaptureError> error_;          // guarded by mutex_: the first one
  std::shared_ptr<FinishedCapture> finished_;  // guarded by mutex_

  // Last: their threads use what stands above.
  std::unique_ptr<MovieOutput> movie_;  // recording thread
  MediaCutter cutter_;                  // recording thread
};

}  // namespace lmx
