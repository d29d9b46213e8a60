// Tells from the properties of listed devices which of them are the same thing, and what each is called.
// Pure.
#pragma once
#include <map>
#include <string>
#include <vector>

namespace lmx {

/// The interface through which a device was found. A camera or microphone may be listed by several of them.
enum class DeviceInterface { v4l2, pipewire, pulse, alsa, other };

/// A device as an interface lists it.
struct ListedDevice {
  DeviceInterface interface = DeviceInterface::other;
  bool isVideo = false;
  std::string name;                               ///< for people
  std::map<std::string, std::string> properties;  ///< as listed, and those below
};
/// Properties that the list adds from sysfs: the physical device, and the number of a video device among
/// those of the same physical device.
inline constexpr const char* kPhysicalDevice = "lmx.physical-device";
inline constexpr const char* kInputIndex = "lmx.input-index";

/// What is known about a device apart from its list entry.
struct DeviceIdentity {
  std::string uniqueID;  ///< "v4l2:…", "alsa:…", "pipewire:…": stays the same over restarts; empty for none
  std::string parent;   ///< identifies the physical device, which a camera and its own microphone share; may
                        ///< be empty
  bool isReal = false;  ///< a piece of hardware, not made up by a program
  bool isDefault = false;  ///< the sound server's own default
  /// Whether it is left out of the list: the same as another entry, or nothing that can be captured from.
  bool hidden = false;
};

/// One identity for each device, in the same order. Of what is listed several times, cameras stay as
/// Video4Linux has them, microphones as the sound server has them: whoever opens ALSA's entry finds it busy.
std::vector<DeviceIdentity> identitiesOf(const std::vector<ListedDevice>& devices);

}  // namespace lmx
