// One open device: its GStreamer pipeline and what comes out of it.
#pragma once
#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <optional>

#include "capture/api/capture_framework.h"
#include "capture/gst/gst_handles.h"
#include "capture/source/camera_mode.h"
#include "capture/source/device_id.h"
#include "capture/source/devices.h"
#include "capture/source/file_pacer.h"
#include "capture/source/stream_clock.h"
#include "support/result.h"

namespace lmx {

/// What all sources deliver sound in: interleaved 32-bit floats.
inline constexpr int kSoundRate = 48000;  ///< Hz
inline constexpr int kSoundChannels = 2;

/// Takes what a device delivers, on streaming threads.
struct DeviceOutput {
  /// @param time  running time, seconds
  std::function<void(GstSample* picture, double time)> onPicture;
  /// @param time  running time of its first sample as the device, or the network, says
  /// @param arrival  running time at which its last sample was there
  std::function<void(GstBuffer* sound, double time, double arrival)> onSound;
};

/// Opens a device and closes it with its destruction, which waits for the streaming threads: a driver may
/// take its time for either, so both are done on the source's own thread.
class DevicePipeline {
 public:
  struct Wish {
    DeviceID device;
    bool picture = false;  ///< of hardware and synthetic devices, which give one of both
    bool overUdp = false;  ///< how a network camera sends
    CameraDemand demand;   ///< the greatest picture and rate that are any use
    std::shared_ptr<const HardwareDevice> hardware;  ///< the device, if it is hardware from the list
  };

  /// Builds the pipeline and starts it, but for devices of "speed=max".
  /// @param pacer  of a file; outlives the pipeline
  static Result<std::unique_ptr<DevicePipeline>, CaptureError> open(const Wish& wish, FilePacer& pacer,
                                                                    DeviceOutput output);
  ~DevicePipeline();
  DevicePipeline(const DevicePipeline&) = delete;
  DevicePipeline& operator=(const DevicePipeline&) = delete;

  /// Starts the flow of a device of "speed=max". Any thread.
  void start();
  /// Handles what the device says, for `limit` at most, or until wake().
  /// @return why it delivers no more: kStreamEnded at the end of a file or stream
  [[nodiscard]] std::optional<CaptureError> watch(std::chrono::milliseconds limit);
  /// Ends a watch() at once. Any thread.
  void wake();

  /// Whether the device has sound; true as long as that isn't known.
  [[nodiscard]] bool mayHaveSound() const { return may_have_sound_; }
  /// The mode that was chosen, in words; empty where there is nothing to choose.
  [[nodiscard]] const std::string& mode() const { return mode_; }

 private:
  DevicePipeline(const Wish& wish, FilePacer& pacer, DeviceOutput output);
  [[nodiscard]] std::optional<CaptureError> build(const Wish& wish);
  [[nodiscard]] std::optional<CaptureError> addHardware(const Wish& wish);
  [[nodiscard]] std::optional<CaptureError> addDecoder(GstElement* source, const GstCaps* caps);
  [[nodiscard]] std::optional<CaptureError> addUri();
  GstElement* addBranch(bool picture);
  void take(GstElement* branch, const char* name, bool picture);
  [[nodiscard]] CaptureError error(CaptureErrorCode code, const std::string& problem) const;
  [[nodiscard]] std::optional<CaptureError> errorFrom(GstMessage* message) const;

  static void onPad(GstElement* decoder, GstPad* pad, gpointer self) noexcept;
  static void onNoMorePads(GstElement* decoder, gpointer self) noexcept;
  static void onUriSource(GstElement* decoder, GstElement* source, gpointer self) noexcept;
  static GstFlowReturn onPictureSample(GstElement* sink, gpointer self) noexcept;
  static GstFlowReturn onSoundSample(GstElement* sink, gpointer self) noexcept;
  void linkPad(GstPad* pad);
  void deliver(GstSample* sample, bool picture);
  [[nodiscard]] std::optional<double> timeOf(GstSample* sample, double seconds);

  const DeviceID device_;
  const bool real_time_;
  const bool picture_wanted_;
  const bool over_udp_;
  FilePacer& pacer_;
  const DeviceOutput output_;
  std::string mode_;
  StreamClock stream_clock_;  ///< of a network camera
  GstHandle<GstElement> pipeline_;
  GstHandle<GstBus> bus_;
  std::atomic<bool> may_have_sound_{true};
  std::atomic<bool> has_picture_{false};
  std::atomic<bool> has_sound_{false};
};

}  // namespace lmx
