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

  /// Identifies the source: equal for equal sources, different for others.
  [[nodiscard]] std::string key() const;
  /// For messages: the camera, or the microphone where there is no camera.
  [[nodiscard]] std::string name() const { return videoDevice.value_or(audioDevice.value_or("")); }
  /// The identifiers taken apart; of kind "unknown" where there is no device.
  [[nodiscard]] DeviceID video() const { return parseDeviceID(videoDevice.value_or("")); }
  [[nodiscard]] DeviceID audio() const { return parseDeviceID(audioDevice.value_or("")); }
  /// Whether picture and sound come from the same device.
  [[nodiscard]] bool oneDevice() const { return videoDevice == audioDevice; }
};

}  // namespace lmx
