// Lists cameras and microphones through GStreamer's device monitor.
#include "capture/source/devices.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <tuple>
#include <utility>

#include "capture/source/device_identity.h"
#include "capture/source/device_list.h"
#include "capture/source/pipewire_provider.h"
#include "capture/source/pulse_provider.h"

namespace lmx {
namespace {

struct Found {
  HardwareDevice device;
  bool hidden = false;
};

DeviceInterface interfaceOf(GstDevice* device) {
  const std::string type = G_OBJECT_TYPE_NAME(device);
  if (type == "GstV4l2Device") return DeviceInterface::v4l2;
  if (type == "GstPipeWireDevice") return DeviceInterface::pipewire;
  if (type == "GstPulseDevice") return DeviceInterface::pulse;
  if (type == "GstAlsaDevice") return DeviceInterface::alsa;
  return DeviceInterface::other;
}

gboolean takeProperty(GQuark key, const GValue* value, gpointer properties) {
  GValue text = G_VALUE_INIT;
  g_value_init(&text, G_TYPE_STRING);
  if (g_value_transform(value, &text) != FALSE && g_value_get_string(&text) != nullptr) {
    auto& all = *static_cast<std::map<std::string, std::string>*>(properties);
    all[g_quark_to_string(key)] = g_value_get_string(&text);
  }
  g_value_unset(&text);
  return TRUE;
}

/// The folder of the physical device to which an interface or a function in sysfs belongs; empty when
/// unknown.
std::string physicalDevice(const std::filesystem::path& link) {
  std::error_code problem;
  const auto path = std::filesystem::canonical(link, problem);
  if (problem) return {};
  // "1-1:1.0" is an interface of the USB device "1-1"; "0000:00:1f.3" is a whole PCI function.
  const std::string last = path.filename();
  const bool usbInterface = last.find(':') != std::string::npos && last.find('-') < last.find(':');
  return usbInterface ? path.parent_path() : path;
}

/// Adds what the list doesn't tell, from sysfs.
void addPlace(ListedDevice& device) {
  const std::filesystem::path classes = "/sys/class";
  auto& all = device.properties;
  const auto either = [&](const char* one, const char* other) {
    return all.contains(one) ? all[one] : all[other];
  };
  if (!device.isVideo) {
    const std::string card = either("alsa.card", "api.alsa.pcm.card");
    if (!card.empty()) all[kPhysicalDevice] = physicalDevice(classes / "sound" / ("card" + card) / "device");
    return;
  }
  const std::string node = std::filesystem::path(either("device.path", "api.v4l2.path")).filename();
  if (node.empty()) return;
  all[kPhysicalDevice] = physicalDevice(classes / "video4linux" / node / "device");
  std::ifstream(classes / "video4linux" / node / "index") >> all[kInputIndex];
}

ListedDevice listed(GstDevice* device) {
  ListedDevice entry{.interface = interfaceOf(device),
                     .isVideo = gst_device_has_classes(device, "Video/Source") != FALSE,
                     .name = GText(gst_device_get_display_name(device)).get(),
                     .properties = {}};
  GstStructure* properties = gst_device_get_properties(device);
  if (properties != nullptr) {
    gst_structure_foreach(properties, takeProperty, &entry.properties);
    gst_structure_free(properties);
  }
  addPlace(entry);
  return entry;
}

HardwareDevice described(GstHandle<GstDevice> device, const ListedDevice& entry,
                         const DeviceIdentity& identity) {
  HardwareDevice result;
  const CapsHandle caps(gst_device_get_caps(device.get()));
  result.uniqueID = identity.uniqueID;
  result.name = entry.name;
  result.parent = identity.parent;
  result.isVideo = entry.isVideo;
  result.isReal = identity.isReal;
  result.isDefault = identity.isDefault;
  result.formats = formatsText(caps.get(), entry.isVideo);
  if (entry.isVideo) result.modes = offeredModes(caps.get());
  result.device = std::move(device);
  return result;
}

/// The devices of some classes. @param classes  all devices when there are none
std::vector<GstHandle<GstDevice>> devicesOf(std::initializer_list<const char*> classes) {
  ensureGStreamer();
  // A plug-in's provider is one object for the whole process, and not made to be asked by two at once.
  static std::mutex mutex;
  static auto* pipewire = new PipeWireProvider;  // never destroyed: threads that outlive main may list
  const std::lock_guard lock(mutex);
  askPulseOnlyIfThere();
  pipewire->keepUp();
  const GstHandle<GstDeviceMonitor> monitor(gst_device_monitor_new());
  for (const char* name : classes) gst_device_monitor_add_filter(monitor.get(), name, nullptr);
  std::vector<GstHandle<GstDevice>> devices;
  GList* found = gst_device_monitor_get_devices(monitor.get());
  for (GList* item = found; item != nullptr; item = item->next) devices.emplace_back(GST_DEVICE(item->data));
  g_list_free(found);
  return devices;
}

std::vector<Found> everything() {
  auto devices = devicesOf({"Video/Source", "Audio/Source"});
  std::vector<ListedDevice> entries;
  entries.reserve(devices.size());
  for (const auto& device : devices) entries.push_back(listed(device.get()));
  const auto identities = identitiesOf(entries);
  std::vector<Found> all;
  for (std::size_t i = 0; i < devices.size(); ++i)
    all.push_back({described(std::move(devices[i]), entries[i], identities[i]), identities[i].hidden});
  return all;
}

bool canDecode(const char* caps) {
  const CapsHandle wanted(gst_caps_from_string(caps));
  GList* decoders = gst_element_factory_list_get_elements(GST_ELEMENT_FACTORY_TYPE_DECODER |
                                                              GST_ELEMENT_FACTORY_TYPE_MEDIA_IMAGE |
                                                              GST_ELEMENT_FACTORY_TYPE_MEDIA_VIDEO,
                                                          GST_RANK_MARGINAL);
  GList* fitting = gst_element_factory_list_filter(decoders, wanted.get(), GST_PAD_SINK, FALSE);
  const bool any = fitting != nullptr;
  gst_plugin_feature_list_free(fitting);
  gst_plugin_feature_list_free(decoders);
  return any;
}

}  // namespace

std::vector<HardwareDevice> listHardware() {
  std::vector<HardwareDevice> devices;
  for (Found& found : everything()) {
    if (!found.hidden) devices.push_back(std::move(found.device));
  }
  sortDevices(devices);
  return devices;
}

HardwareDevice copyOf(const HardwareDevice& device) {
  HardwareDevice copy;
  copy.uniqueID = device.uniqueID;
  copy.name = device.name;
  copy.parent = device.parent;
  copy.formats = device.formats;
  copy.modes = device.modes;
  copy.isVideo = device.isVideo;
  copy.isReal = device.isReal;
  copy.isDefault = device.isDefault;
  copy.device.reset(GST_DEVICE(gst_object_ref(device.device.get())));
  return copy;
}

void sortDevices(std::vector<HardwareDevice>& devices) {
  std::sort(devices.begin(), devices.end(), [](const HardwareDevice& one, const HardwareDevice& other) {
    return std::tuple(!one.isVideo, !one.isReal, !one.isDefault, one.uniqueID) <
           std::tuple(!other.isVideo, !other.isReal, !other.isDefault, other.uniqueID);
  });
}

std::optional<HardwareDevice> findHardware(const std::string& uniqueID) {
  if (uniqueID.empty()) return std::nullopt;  // so would be devices that can't be told from others
  std::vector<Found> all = everything();
  std::stable_sort(all.begin(), all.end(),
                   [](const Found& one, const Found& other) { return one.hidden < other.hidden; });
  for (Found& found : all) {
    if (found.device.uniqueID == uniqueID) return std::move(found.device);
  }
  return std::nullopt;
}

bool isHardwareThere(const std::string& uniqueID) {
  if (uniqueID.starts_with("alsa:device=") || findHardware(uniqueID)) return true;
  for (const auto& device : devicesOf({})) {
    const ListedDevice entry = listed(device.get());
    const auto node = entry.properties.find("node.name");
    if (node != entry.properties.end() && uniqueID == "pipewire:" + node->second) return true;
  }
  return false;
}

CameraDemand demandHere(PictureSize size, double maximumRate) {
  ensureGStreamer();
  return {.size = size,
          .maximumRate = maximumRate,
          .decodesJPEG = canDecode("image/jpeg"),
          .decodesH264 = canDecode("video/x-h264")};
}

}  // namespace lmx
