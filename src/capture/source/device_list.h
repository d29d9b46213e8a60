// The machine's capture devices: which one is the default, which microphone goes with a camera, and all of
// them in words.
#pragma once
#include <string>
#include <vector>

#include "capture/api/capture_settings.h"
#include "capture/source/devices.h"

namespace lmx {

/// What "Automatic" takes: the first camera or the first microphone that is real hardware; null when there is
/// none.
const HardwareDevice* firstDevice(const std::vector<HardwareDevice>& devices, bool video);

/// The camera's own microphone, else the one that "Automatic" takes, if there is any.
CaptureCatalog::PreferredAudio microphoneFor(const std::vector<HardwareDevice>& devices,
                                             const std::string& cameraID);

/// A list for people, by media type: each device's identifier as it goes into the preferences, its name and
/// formats, the mode a camera is opened with and why, its microphone; which device "Automatic" takes and why;
/// then the devices that need no hardware and those that no list shows.
std::string deviceListText(const std::vector<HardwareDevice>& devices, const CameraDemand& demand);

/// Picture sizes with their frame rates, or sample rates with their channels, the largest first.
std::string formatsText(const GstCaps* caps, bool video);

}  // namespace lmx
