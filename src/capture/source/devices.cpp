// Lists cameras and microphones: PipeWire's by its own library, the others through GStreamer's device
// monitor.
#include "capture/source/devices.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <set>
#include <tuple>
#include <utility>

#include "capture/source/device_identity.h"
#include "capture/source/device_list.h"
#include "capture/source/device_providers.h"
#include "capture/source/pipewire_devices.h"

namespace lmx {
namespace {

struct Found {
  HardwareDevice device;
  bool hidden = false;
};

struct Everything {
  std::vector<Found> devices;
  std::set<std::string> others;  ///< names of PipeWire's nodes that are neither cameras nor microphones
};

/// A list's entry with what identifying it does not need.
struct Entry {
  ListedDevice listed;
  CapsHandle caps;        ///< may be null
  HardwareDevice device;  ///< how it is opened
};

DeviceInterface interfaceOf(GstDevice* device) {
  const std::string type = G_OBJECT_TYPE_NAME(device);
  if (type == "GstV4l2Device") return DeviceInterface::v4l2;
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

Entry entryOf(GstHandle<GstDevice> device) {
  Entry entry;
  entry.listed = {.interface = interfaceOf(device.get()),
                  .isVideo = gst_device_has_classes(device.get(), "Video/Source") != FALSE,
                  .name = GText(gst_device_get_display_name(device.get())).get(),
                  .properties = {}};
  GstStructure* properties = gst_device_get_properties(device.get());
  if (properties != nullptr) {
    gst_structure_foreach(properties, takeProperty, &entry.listed.properties);
    gst_structure_free(properties);
  }
  addPlace(entry.listed);
  entry.caps.reset(gst_device_get_caps(device.get()));
  entry.device.device = std::move(device);
  return entry;
}

Entry entryOf(PipeWireNode node) {
  Entry entry;
  entry.device.pipewireNode = targetOf(node);
  entry.listed = {.interface = DeviceInterface::pipewire,
                  .isVideo = isCapture(node, true),
                  .name = nameOf(node),
                  .properties = std::move(node.properties)};
  addPlace(entry.listed);
  entry.caps = std::move(node.caps);
  return entry;
}

HardwareDevice described(Entry entry, const DeviceIdentity& identity) {
  HardwareDevice result = std::move(entry.device);
  result.uniqueID = identity.uniqueID;
  result.name = entry.listed.name;
  result.parent = identity.parent;
  result.isVideo = entry.listed.isVideo;
  result.isReal = identity.isReal;
  result.isDefault = identity.isDefault;
  result.formats = formatsText(entry.caps.get(), result.isVideo);
  if (result.isVideo) result.modes = offeredModes(entry.caps.get());
  return result;
}

/// PipeWire's, unless nothing here could open them. What can't be recorded from is named in `others`.
void addPipeWire(std::vector<Entry>& entries, std::set<std::string>& others,
                 std::set<std::string>& replaced) {
  static auto* pipewire = new PipeWireDevices;  // never destroyed: threads that outlive main may list
  const GstHandle<GstElementFactory> opener(gst_element_factory_find("pipewiresrc"));
  if (!opener) return;
  for (PipeWireNode& node : pipewire->list()) {
    replaced.insert(providerReplacedBy(node));
    if (!goesOneWay(node) || targetOf(node).empty()) continue;
    if (isCapture(node, true) || isCapture(node, false))
      entries.push_back(entryOf(std::move(node)));
    else
      others.insert(node.properties["node.name"]);
  }
}

void addOthers(std::vector<Entry>& entries, const std::set<std::string>& replaced) {
  chooseProviders(replaced);
  const GstHandle<GstDeviceMonitor> monitor(gst_device_monitor_new());
  for (const char* name : {"Video/Source", "Audio/Source"})
    gst_device_monitor_add_filter(monitor.get(), name, nullptr);
  GList* found = gst_device_monitor_get_devices(monitor.get());
  for (GList* item = found; item != nullptr; item = item->next)
    entries.push_back(entryOf(GstHandle<GstDevice>(GST_DEVICE(item->data))));
  g_list_free(found);
}

Everything everything() {
  ensureGStreamer();
  // A plug-in's provider is one object for the whole process, and not made to be asked by two at once.
  static std::mutex mutex;
  Everything all;
  std::vector<Entry> entries;
  {
    const std::lock_guard lock(mutex);
    std::set<std::string> replaced;
    addPipeWire(entries, all.others, replaced);
    addOthers(entries, replaced);
  }
  std::vector<ListedDevice> listed;
  listed.reserve(entries.size());
  for (const Entry& entry : entries) listed.push_back(entry.listed);
  const auto identities = identitiesOf(listed);
  for (std::size_t i = 0; i < entries.size(); ++i)
    all.devices.push_back({described(std::move(entries[i]), identities[i]), identities[i].hidden});
  return all;
}

std::optional<HardwareDevice> deviceNamed(std::vector<Found> all, const std::string& uniqueID) {
  if (uniqueID.empty()) return std::nullopt;  // so would be devices that can't be told from others
  std::stable_sort(all.begin(), all.end(),
                   [](const Found& one, const Found& other) { return one.hidden < other.hidden; });
  for (Found& found : all) {
    if (found.device.uniqueID == uniqueID) return std::move(found.device);
  }
  return std::nullopt;
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
  for (Found& found : everything().devices) {
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
  copy.pipewireNode = device.pipewireNode;
  if (device.device) copy.device.reset(GST_DEVICE(gst_object_ref(device.device.get())));
  return copy;
}

void sortDevices(std::vector<HardwareDevice>& devices) {
  std::sort(devices.begin(), devices.end(), [](const HardwareDevice& one, const HardwareDevice& other) {
    return std::tuple(!one.isVideo, !one.isReal, !one.isDefault, one.uniqueID) <
           std::tuple(!other.isVideo, !other.isReal, !other.isDefault, other.uniqueID);
  });
}

std::optional<HardwareDevice> findHardware(const std::string& uniqueID) {
  return deviceNamed(everything().devices, uniqueID);
}

bool isHardwareThere(const std::string& uniqueID) {
  if (uniqueID.starts_with("alsa:device=")) return true;
  Everything all = everything();
  return deviceNamed(std::move(all.devices), uniqueID) ||
         std::any_of(all.others.begin(), all.others.end(), [&](const std::string& node) {
           return !node.empty() && uniqueID == "pipewire:" + node;
         });
}

GstHandle<GstElement> sourceFor(const HardwareDevice& device) {
  GstElement* source = device.device ? gst_device_create_element(device.device.get(), nullptr)
                                     : gst_element_factory_make("pipewiresrc", nullptr);
  if (source == nullptr) return nullptr;
  gst_object_ref_sink(source);
  if (!device.device) g_object_set(source, "target-object", device.pipewireNode.c_str(), nullptr);
  return GstHandle<GstElement>(source);
}

CameraDemand demandHere(PictureSize size, double maximumRate) {
  ensureGStreamer();
  return {.size = size,
          .maximumRate = maximumRate,
          .decodesJPEG = canDecode("image/jpeg"),
          .decodesH264 = canDecode("video/x-h264")};
}

}  // namespace lmx
