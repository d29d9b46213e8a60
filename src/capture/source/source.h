// A camera or a microphone that is open, or being opened, for all who use it.
#pragma once
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "capture/api/capture_framework.h"
#include "capture/source/capture_clock.h"
#include "capture/source/capture_consumers.h"
#include "capture/source/device_pipeline.h"
#include "capture/source/retry_policy.h"
#include "capture/source/steady_sound.h"

namespace lmx {

/// The microphone that stands for whichever there is: the first one, looked for until there is one.
inline constexpr const char* kAnyMicrophone = "microphone:any";

/// What a source is opened for. The first user's wish counts: the others share what is open.
struct SourceWish {
  std::string device;   ///< its unique identifier
  bool picture = true;  ///< opened as a camera; else as a microphone
  CameraDemand demand;
};

/// What a camera gives.
struct CameraFormat {
  PictureSize size;               ///< as it is recorded
  std::optional<FrameRate> rate;  ///< nominal; nothing when it varies or isn't known
};

/// Lives on a thread of its own: opens the device, watches it, opens it again and closes it, whatever time
/// the driver takes. A camera that is plugged in is lost when it fails; a network camera is tried again three
/// times in ten seconds first; a microphone is tried again as long as anybody wants it. Thread-safe.
class Source : public CaptureSession {
 public:
  explicit Source(SourceWish wish);
  /// The same device as somebody had it before and is closing: the thread waits for that. Call it before
  /// open().
  void comeAfter(std::shared_ptr<Source> predecessor) { predecessor_ = std::move(predecessor); }
  /// Starts the thread. @return false when there is none to be had
  [[nodiscard]] static bool open(const std::shared_ptr<Source>& source);
  /// Ends the thread, soon: finished() tells. Called once nobody uses the source any more.
  void close();
  /// Whether the device is closed. Waits for that, at most `limit`.
  [[nodiscard]] bool finished(std::chrono::milliseconds limit);

  [[nodiscard]] bool isRunning() const override;
  [[nodiscard]] bool isOpening() const override;
  /// Waits until the source delivers, or has failed to, at most `limit`.
  /// @return why it doesn't deliver
  [[nodiscard]] std::optional<CaptureError> waitUntilRunning(std::chrono::milliseconds limit);
  /// Starts the flow of a device of "speed=max".
  void start();

  [[nodiscard]] CaptureConsumers& consumers() { return consumers_; }
  [[nodiscard]] const CaptureClock& clock() const { return clock_; }
  /// Known once it runs.
  [[nodiscard]] CameraFormat format() const;
  [[nodiscard]] const SourceWish& wish() const { return wish_; }
  /// For messages: its identifier, without a password.
  [[nodiscard]] std::string name() const;
  /// How much faster the microphone's clock runs than the machine's, parts a million.
  [[nodiscard]] double soundCorrection() const { return sound_correction_; }
  /// The hardware that is open; null for other devices, and while it is away.
  [[nodiscard]] std::shared_ptr<const HardwareDevice> hardware() const;

 private:
  using Clock = std::chrono::steady_clock;
  enum class Phase { opening, running, away, lost, closed };

  // The source's thread.
  void live();
  [[nodiscard]] CaptureError openAndWatch();
  [[nodiscard]] CaptureError guardedOpenAndWatch();
  [[nodiscard]] std::optional<CaptureError> watch(DevicePipeline& pipeline);
  [[nodiscard]] std::optional<CaptureError> guardedWatch(DevicePipeline& pipeline);
  [[nodiscard]] std::optional<CaptureError> silence() const;
  [[nodiscard]] Result<std::unique_ptr<DevicePipeline>, CaptureError> openPipeline();
  [[nodiscard]] Result<std::unique_ptr<DevicePipeline>, CaptureError> openInTime(
      const DevicePipeline::Wish& wish, DeviceOutput output);
  [[nodiscard]] bool findHardwareFor(DevicePipeline::Wish& wish);
  [[nodiscard]] bool predecessorHasGone();
  void checkForSound(const DevicePipeline& pipeline);
  [[nodiscard]] RetryPolicy::Failure failure(const CaptureError& error) const;
  void set(Phase phase);

  // Streaming threads.
  void takePicture(GstSample* picture, double time);
  void takeSound(SteadySound* steady, GstBuffer* sound, double time, double arrival);
  void firstSample();

  // Both, and the thread that watches the opening.
  void tellAbsence(const CaptureError& error, const char* next);
  void tellReturn();
  [[nodiscard]] bool closing() const;
  [[nodiscard]] bool startWanted() const;

  const SourceWish wish_;
  const DeviceID device_;
  const CaptureClock clock_;
  CaptureConsumers consumers_;
  FilePacer pacer_;
  std::atomic<double> sound_correction_{0};
  std::atomic<std::int64_t> last_sample_ms_{0};  ///< steady clock; of what the source is watched by
  std::atomic<bool> delivering_{false};          ///< since it was opened last
  std::atomic<std::int64_t> last_sound_ms_{0};   ///< steady clock; 0 before there was any
  std::atomic<std::int64_t> mute_since_ms_{0};   ///< steady clock; 0 while its sound comes
  std::atomic<bool> has_format_{false};
  std::atomic<bool> ever_ran_{false};
  std::atomic<std::int64_t> away_since_ms_{0};  ///< steady clock; 0 when it isn't

  // The source's thread.
  std::shared_ptr<Source> predecessor_;  ///< null once it has closed the device
  RetryPolicy retries_;
  Clock::time_point begun_at_;
  Clock::time_point opened_at_;
  std::shared_ptr<const HardwareDevice> found_;

  mutable std::mutex mutex_;
  std::condition_variable changed_;
  Phase phase_ = Phase::opening;                    // guarded by mutex_
  bool closing_ = false;                            // guarded by mutex_
  bool finished_ = false;                           // guarded by mutex_
  bool start_wanted_ = false;                       // guarded by mutex_
  DevicePipeline* pipeline_ = nullptr;              // guarded by mutex_: null unless it is open
  std::optional<CaptureError> problem_;             // guarded by mutex_: the last one
  std::optional<CameraFormat> format_;              // guarded by mutex_
  std::shared_ptr<const HardwareDevice> hardware_;  // guarded by mutex_
};

}  // namespace lmx
