// Lists the capture devices of the machine.
#pragma once
#include <optional>
#include <string>
#include <vector>

#include "capture/gst/gst_handles.h"

namespace lmx {

/// A camera or a microphone that is plugged in.
struct HardwareDevice {
  std::string uniqueID;  ///< "v4l2:…", "alsa:…", "pipewire:…": stays the same over restarts
  std::string name;      ///< for people
  std::string
      parent;  ///< identifies the physical device: a camera and its own microphone share it; may be empty
  std::string formats;  ///< for people
  bool isVideo = false;
  GstHandle<GstDevice> device;
};

/// What is plugged in now, cameras first, each device once. Blocks for some milliseconds. Thread-safe.
std::vector<HardwareDevice> listHardware();

/// The plugged-in device with that identifier; nothing when there is none.
std::optional<HardwareDevice> findHardware(const std::string& uniqueID);

}  // namespace lmx
