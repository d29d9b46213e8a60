// Lists cameras and microphones through GStreamer's device monitor.
#include "capture/source/devices.h"

#include <algorithm>
#include <set>

#include "capture/source/device_list.h"

namespace lmx {
namespace {

std::string property(const GstStructure* properties, const char* key) {
  const char* value = properties == nullptr ? nullptr : gst_structure_get_string(properties, key);
  return value == nullptr ? std::string() : std::string(value);
}

std::string firstOf(const GstStructure* properties, std::initializer_list<const char*> keys) {
  for (const char* key : keys) {
    std::string value = property(properties, key);
    if (!value.empty()) return value;
  }
  return {};
}

/// An identifier that survives a restart: the place where the device is plugged in or its serial number
/// rather than a /dev name.
std::string uniqueIdentifier(const GstStructure* properties, bool isVideo) {
  const std::string node = property(properties, "node.name");
  if (!node.empty()) return "pipewire:" + node;
  if (isVideo) {
    return "v4l2:" + firstOf(properties, {"device.bus_path", "device.bus-path", "device.serial",
                                          "api.v4l2.path", "device.path", "v4l2.device.bus_info"});
  }
  return "alsa:" + firstOf(properties, {"device.bus_path", "device.bus-path", "device.serial",
                                        "alsa.card_name", "api.alsa.path", "device.string", "device.api"});
}

HardwareDevice describeDevice(GstHandle<GstDevice> device, bool isVideo) {
  HardwareDevice result;
  GstStructure* properties = gst_device_get_properties(device.get());
  result.uniqueID = uniqueIdentifier(properties, isVideo);
  result.parent = firstOf(properties, {"device.bus_path", "device.bus-path", "device.serial", "device.id"});
  if (properties != nullptr) gst_structure_free(properties);
  result.name = GText(gst_device_get_display_name(device.get())).get();
  result.formats = formatsText(CapsHandle(gst_device_get_caps(device.get())).get(), isVideo);
  result.isVideo = isVideo;
  result.device = std::move(device);
  return result;
}

bool isMonitorOfASpeaker(GstDevice* device) {
  GstStructure* properties = gst_device_get_properties(device);
  const bool monitor = property(properties, "device.class") == "monitor";
  if (properties != nullptr) gst_structure_free(properties);
  return monitor;
}

}  // namespace

std::vector<HardwareDevice> listHardware() {
  ensureGStreamer();
  const GstHandle<GstDeviceMonitor> monitor(gst_device_monitor_new());
  gst_device_monitor_add_filter(monitor.get(), "Video/Source", nullptr);
  gst_device_monitor_add_filter(monitor.get(), "Audio/Source", nullptr);
  std::vector<HardwareDevice> devices;
  GList* found = gst_device_monitor_get_devices(monitor.get());
  std::set<std::string> seen;
  for (GList* item = found; item != nullptr; item = item->next) {
    GstHandle<GstDevice> device(GST_DEVICE(item->data));
    if (isMonitorOfASpeaker(device.get())) continue;
    const bool isVideo = gst_device_has_classes(device.get(), "Video/Source");
    HardwareDevice described = describeDevice(std::move(device), isVideo);
    // A microphone is listed once for each interface of the sound server; name and place are the same.
    const std::string same = (isVideo ? "v" : "a") + described.name + described.parent;
    if (seen.insert(same).second) devices.push_back(std::move(described));
  }
  g_list_free(found);
  std::stable_sort(devices.begin(), devices.end(),
                   [](const auto& a, const auto& b) { return a.isVideo > b.isVideo; });
  return devices;
}

std::optional<HardwareDevice> findHardware(const std::string& uniqueID) {
  for (HardwareDevice& device : listHardware()) {
    if (device.uniqueID == uniqueID) return std::move(device);
  }
  return std::nullopt;
}

}  // namespace lmx
