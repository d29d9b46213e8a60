// Lists the capture devices of the machine.
#pragma once
#include <optional>
#include <string>
#include <vector>

#include "capture/gst/gst_handles.h"
#include "capture/source/camera_mode.h"

namespace lmx {

/// A camera or a microphone that is there.
struct HardwareDevice {
  std::string uniqueID;  ///< "v4l2:…", "alsa:…", "pipewire:…": stays the same over restarts
  std::string name;      ///< for people
  std::string
      parent;  ///< identifies the physical device: a camera and its own microphone share it; may be empty
  std::string formats;            ///< for people
  std::vector<CameraMode> modes;  ///< of a camera; empty when it doesn't tell them
  bool isVideo = false;
  bool isReal = true;           ///< a piece of hardware, not made up by a program
  bool isDefault = false;       ///< the sound server's own default
  GstHandle<GstDevice> device;  ///< null for one of PipeWire's
  std::string pipewireNode;     ///< the name of PipeWire's node for a pipewiresrc; else empty
};

/// What is there now, each device once: cameras first, real hardware first, the sound server's default first,
/// then by identifier. Opens no device for capturing. Blocks for some milliseconds. Thread-safe.
std::vector<HardwareDevice> listHardware();

/// The same device once more.
HardwareDevice copyOf(const HardwareDevice& device);

/// Puts devices into that order.
void sortDevices(std::vector<HardwareDevice>& devices);

/// The device with that identifier, which may also be one under which the list has it no more because another
/// interface lists the same device; nothing when there is none. Blocks for some milliseconds. Thread-safe.
std::optional<HardwareDevice> findHardware(const std::string& uniqueID);

/// Whether a "v4l2:…", "alsa:…" or "pipewire:…" can be opened as far as one can tell without opening it:
/// findHardware() knows it, or it is any output of PipeWire's, or "alsa:device=NAME", a name in ALSA's own
/// configuration. Blocks for some milliseconds. Thread-safe.
bool isHardwareThere(const std::string& uniqueID);

/// A new element that captures from the device, not yet set up; null when it can't be made. Thread-safe.
GstHandle<GstElement> sourceFor(const HardwareDevice& device);

/// What is wanted of a camera on this machine: what it can decode is asked of GStreamer. Thread-safe.
CameraDemand demandHere(PictureSize size = kFullHD, double maximumRate = 30);

}  // namespace lmx
