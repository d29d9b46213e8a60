// An open camera and microphone: raw frames and samples on one monotonic clock, shared by all who need them.
#pragma once
#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "capture/api/capture_framework.h"
#include "capture/gst/gst_handles.h"
#include "capture/source/device_id.h"

namespace lmx {

/// What to open. Two users that ask for the same share one pipeline.
struct CaptureSource {
  std::optional<std::string> videoDevice;
  std::optional<std::string> audioDevice;
  FrameRate frameRate;
  int sampleRate = 48000;
  int channels = 2;
  [[nodiscard]] std::string key() const;
};

/// Gets what is captured, on streaming threads. Must return quickly: copy, queue, return.
class CaptureConsumer {
 public:
  virtual ~CaptureConsumer() = default;
  /// @param buffer  an I420 frame of the pipeline's size (a reference for the consumer)
  /// @param runningTime  seconds
  virtual void onVideo(BufferHandle buffer, double runningTime) = 0;
  /// @param buffer  interleaved 32-bit float samples
  virtual void onAudio(BufferHandle buffer, double runningTime) = 0;
  virtual void onCaptureError(const CaptureError& error) = 0;
};

class CapturePipeline : public CaptureSession {
 public:
  /// A user's hold on a pipeline. The device is closed when the last one goes, before anybody can open it
  /// again. Never drop the last one on a streaming thread.
  using Lease = std::shared_ptr<CapturePipeline>;

  /// Opens the devices, or joins the pipeline that has them open. Blocks while a device opens. Thread-safe.
  /// @return null with `*error` set.
  static Lease acquire(const CaptureSource& source, CaptureError* error);

  ~CapturePipeline() override;
  [[nodiscard]] bool isRunning() const override { return running_; }

  /// Starts the flow, when it does not run yet. Only pipelines of "speed=max" wait for this.
  void start();
  void addConsumer(const std::shared_ptr<CaptureConsumer>& consumer);
  void removeConsumer(const CaptureConsumer* consumer);

  /// Running time that corresponds to a wall-clock time (seconds since 2001-01-01 UTC), by today's wall
  /// clock.
  [[nodiscard]] double runningTimeAt(double wallTime) const;
  /// Running time now.
  [[nodiscard]] double runningTime() const;
  /// Wall-clock time of running time 0.
  [[nodiscard]] double wallOffset() const;
  [[nodiscard]] bool realTime() const { return real_time_; }

  [[nodiscard]] const CaptureSource& source() const { return source_; }
  /// Size of the frames, pixels; 0 before the first frame of a device whose size is not known beforehand.
  [[nodiscard]] PictureSize size() const;

 private:
  explicit CapturePipeline(const CaptureSource& source);
  static Lease lease(const std::string& key, const std::shared_ptr<CapturePipeline>& pipeline);

  bool open(CaptureError* error);
  std::string describe(std::string* problem);
  bool addHardware(CaptureError* error);
  bool settle(CaptureError* error);
  void attachSinks();
  void watchBus();
  void handleMessage(GstMessage* message);
  void checkForSilence();
  void loopFile(bool flush);
  void report(const CaptureError& error);
  [[nodiscard]] CaptureError errorFrom(GstMessage* message) const;
  void close();

  static GstFlowReturn newVideoSample(GstElement* sink, gpointer self) noexcept;
  static GstFlowReturn newAudioSample(GstElement* sink, gpointer self) noexcept;
  void deliver(GstElement* sink, bool video);

  const CaptureSource source_;
  DeviceID video_;
  DeviceID audio_;
  bool real_time_ = true;
  double opened_at_ = 0;  ///< wall clock at running time 0, when not in real time

  GstHandle<GstElement> pipeline_;
  GstHandle<GstElement> video_sink_;
  GstHandle<GstElement> audio_sink_;
  std::atomic<bool> running_{false};
  std::atomic<bool> ending_{false};
  std::atomic<std::int64_t> last_video_ms_{0};  // steady clock
  std::atomic<std::int64_t> last_audio_ms_{0};
  std::atomic<int> width_{0};
  std::atomic<int> height_{0};

  mutable std::mutex consumers_mutex_;
  std::vector<std::weak_ptr<CaptureConsumer>> consumers_;  // guarded by consumers_mutex_
  std::optional<CaptureError> failure_;                    // guarded by consumers_mutex_

  std::thread bus_thread_;  // last: it uses everything above
};

}  // namespace lmx
