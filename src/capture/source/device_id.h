// Unique identifiers of capture devices and the options of the synthetic ones. Pure.
#pragma once
#include <map>
#include <optional>
#include <string>

#include "capture/api/picture.h"

namespace lmx {

enum class DeviceKind { hardware, file, network, test, unknown };  ///< unknown: can't be an identifier

/// A parsed identifier, such as "v4l2:usb-1" or "test://video?size=640x360&lost-after=2".
struct DeviceID {
  DeviceKind kind = DeviceKind::unknown;
  std::string text;  ///< as given
  std::string name;  ///< without scheme and options: "video", "/path/a.mov", "usb-1"
  std::map<std::string, std::string> options;  ///< test devices only

  /// The value of a synthetic device's option; nothing without that option.
  [[nodiscard]] std::optional<double> seconds(const std::string& option) const;
  /// Whether it is a synthetic device with "speed=max": it delivers as fast as the machine can, for tests
  /// with hours of media.
  [[nodiscard]] bool asFastAsPossible() const;
  /// The NAME of "alsa:device=NAME", which is no listed device but a PCM of ALSA's own configuration.
  [[nodiscard]] std::optional<std::string> alsaName() const;
  /// Whether a microphone could have this identifier. Video4Linux devices have no sound.
  [[nodiscard]] bool canBeMicrophone() const;
};
/// A scheme alone, a file without its whole path and an address without a host are of kind unknown. Whether
/// such a device is there is another question.
DeviceID parseDeviceID(const std::string& text);

/// The "rate" option of a synthetic camera, frames a second; nothing without one.
std::optional<FrameRate> syntheticRate(const DeviceID& id);

/// The "size" option of a synthetic camera, forced to even numbers between 64 and 4096; 1280x720 without one.
PictureSize pictureSize(const DeviceID& id);

}  // namespace lmx
