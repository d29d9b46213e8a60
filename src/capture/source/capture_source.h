// Which devices are captured, and in what format. Pure.
#pragma once
#include <optional>
#include <string>

#include "capture/api/picture.h"
#include "capture/source/device_id.h"

namespace lmx {

/// What to open; at least one device. Two users that ask for the same share one pipeline.
struct CaptureSource {
  std::optional<std::string> videoDevice;
  std::optional<std::string> audioDevice;
  FrameRate frameRate;
  int sampleRate = 48000;  ///< Hz
  int channels = 2;

  /// The same for equal sources only.
  [[nodiscard]] std::string key() const;
  /// The camera; the microphone where there is none.
  [[nodiscard]] std::string name() const { return videoDevice.value_or(audioDevice.value_or("")); }
  /// Of kind "unknown" without a device.
  [[nodiscard]] DeviceID video() const { return parseDeviceID(videoDevice.value_or("")); }
  [[nodiscard]] DeviceID audio() const { return parseDeviceID(audioDevice.value_or("")); }
  /// Whether picture and sound come out of the same device.
  [[nodiscard]] bool oneDevice() const { return videoDevice == audioDevice; }
};

}  // namespace lmx
