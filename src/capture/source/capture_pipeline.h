// An open camera and microphone: raw frames and samples on one monotonic clock.
#pragma once
#include <atomic>
#include <memory>
#include <optional>
#include <thread>

#include "capture/api/capture_framework.h"
#include "capture/gst/gst_handles.h"
#include "capture/source/capture_consumers.h"
#include "capture/source/capture_source.h"
#include "capture/source/silence_watch.h"
#include "support/result.h"

namespace lmx {

/// Running time counts the seconds since the pipeline started; setting the wall clock does not affect it.
/// Thread-safe but for its destruction, which closes the devices and waits for the streaming threads.
class CapturePipeline : public CaptureSession {
 public:
  /// Opens the devices and, unless they are of "speed=max", starts the flow. Blocks for as long as that
  /// takes, at most some seconds.
  static Result<std::shared_ptr<CapturePipeline>, CaptureError> open(const CaptureSource& source);
  ~CapturePipeline() override;

  [[nodiscard]] bool isRunning() const override { return running_; }
  /// Starts the flow if it does not run yet.
  void start();
  [[nodiscard]] CaptureConsumers& consumers() { return consumers_; }

  /// Running time now, seconds.
  [[nodiscard]] double runningTime() const;
  /// Running time that corresponds to a wall-clock time (seconds since 2001-01-01 UTC) as the clock is set
  /// now.
  [[nodiscard]] double runningTimeAt(double wallTime) const;
  /// Wall-clock time of running time 0.
  [[nodiscard]] double wallOffset() const;
  /// False for devices of "speed=max", which deliver as fast as their consumers take.
  [[nodiscard]] bool realTime() const { return real_time_; }

  /// Size of the frames, pixels; 0 before the first frame of a device whose size is not known beforehand.
  [[nodiscard]] PictureSize size() const { return {width_, height_}; }

 private:
  explicit CapturePipeline(const CaptureSource& source);
  void attach(GstHandle<GstElement> pipeline);
  [[nodiscard]] std::optional<CaptureError> settle();
  void begin();

  static GstFlowReturn newVideoSample(GstElement* sink, gpointer self) noexcept;
  static GstFlowReturn newAudioSample(GstElement* sink, gpointer self) noexcept;
  void deliver(CaptureConsumers::Medium medium, GstSample* sample);
  void noteSize(GstSample* sample);

  void watchBus();
  void handleMessage(GstMessage* message);
  void checkForSilence();
  void loopFile(bool flush);
  [[nodiscard]] std::optional<CaptureError> pendingError() const;
  [[nodiscard]] CaptureError errorFrom(GstMessage* message) const;

  const CaptureSource source_;
  const DeviceID video_;
  const DeviceID audio_;
  const bool real_time_;
  double opened_at_ = 0;  ///< wall clock at running time 0, when not in real time

  GstHandle<GstElement> pipeline_;
  GstHandle<GstBus> bus_;
  GstHandle<GstElement> video_sink_;
  GstHandle<GstElement> audio_sink_;
  CaptureConsumers consumers_;
  SilenceWatch silence_;
  std::atomic<bool> running_{false};
  std::atomic<bool> ending_{false};
  std::atomic<int> width_{0};
  std::atomic<int> height_{0};

  std::thread bus_thread_;  // last: it uses everything above
};

}  // namespace lmx
