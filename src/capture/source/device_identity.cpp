// Makes identifiers and finds what is listed twice.
#include "capture/source/device_identity.h"

#include <algorithm>
#include <cstdlib>
#include <initializer_list>
#include <set>

namespace lmx {
namespace {

constexpr unsigned long kVideoCapture = 0x1;
constexpr unsigned long kVideoCaptureOfSeveralPlanes = 0x1000;

std::string property(const ListedDevice& device, const std::string& key) {
  const auto found = device.properties.find(key);
  return found == device.properties.end() ? std::string() : found->second;
}

std::string firstOf(const ListedDevice& device, std::initializer_list<const char*> keys) {
  for (const char* key : keys) {
    std::string value = property(device, key);
    if (!value.empty()) return value;
  }
  return {};
}

std::string withScheme(const char* scheme, const std::string& name) {
  return name.empty() ? std::string() : scheme + name;
}

/// The place where the device is plugged in or its serial number, rather than a /dev name that depends on who
/// came first.
std::string plainIdentifier(const ListedDevice& device) {
  const std::string node = property(device, "node.name");
  if (!node.empty()) return "pipewire:" + node;
  if (device.isVideo) {
    return withScheme("v4l2:", firstOf(device, {"device.bus_path", "device.bus-path", "v4l2.device.bus_info",
                                                "device.serial", "api.v4l2.path", "device.path"}));
  }
  return withScheme("alsa:",
                    firstOf(device, {"device.bus_path", "device.bus-path", "device.serial", "alsa.card_name",
                                     "alsa.name", "api.alsa.path", "device.string"}));
}

/// The physical device, where it is known only by its place: without the number of the USB interface, which
/// differs between the picture and the sound of one camera.
std::string placeOf(const ListedDevice& device) {
  std::string place = firstOf(device, {"device.bus_path", "device.bus-path"});
  const std::size_t usb = place.find("-usb-");
  const std::size_t colon = place.rfind(':');
  if (usb != std::string::npos && colon > usb + 6) place.resize(colon);
  return place.empty() ? firstOf(device, {"device.serial", "device.id"}) : place;
}

bool isProgram(const ListedDevice& device) {
  const std::string driver =
      firstOf(device, {"v4l2.device.driver", "api.v4l2.cap.driver", "alsa.driver_name"});
  return driver == "v4l2 loopback" || driver == "snd_aloop" || driver == "snd_dummy" || driver == "vivid" ||
         property(device, "node.virtual") == "true";
}

bool isReal(const ListedDevice& device) {
  if (isProgram(device)) return false;
  if (device.interface == DeviceInterface::v4l2 || device.interface == DeviceInterface::alsa) return true;
  return !firstOf(device, {"device.api", "device.bus_path", "device.bus-path", "api.v4l2.path",
                           "api.alsa.path", "api.libcamera.path", "api.bluez5.address", kPhysicalDevice})
              .empty();
}

/// Not a camera: the metadata of one, or a speaker's monitor.
bool isNoCapture(const ListedDevice& device) {
  if (property(device, "device.class") == "monitor") return true;
  const std::string capabilities = property(device, "v4l2.device.device_caps");
  if (!device.isVideo || capabilities.empty()) return false;
  return (std::strtoul(capabilities.c_str(), nullptr, 10) & (kVideoCapture | kVideoCaptureOfSeveralPlanes)) ==
         0;
}

/// What is the same for one device in all lists: its /dev name or its sound card. Empty when unknown.
std::string sameness(const ListedDevice& device) {
  if (device.isVideo) return firstOf(device, {"device.path", "api.v4l2.path"});
  return firstOf(device, {"alsa.card", "api.alsa.pcm.card", "api.alsa.card"});
}

/// In which order entries for the same device are preferred.
int preference(const ListedDevice& device) {
  static constexpr DeviceInterface kVideo[] = {DeviceInterface::v4l2, DeviceInterface::pipewire};
  static constexpr DeviceInterface kSound[] = {DeviceInterface::pipewire, DeviceInterface::pulse,
                                               DeviceInterface::alsa};
  if (device.isVideo)
    return static_cast<int>(std::find(std::begin(kVideo), std::end(kVideo), device.interface) - kVideo);
  return static_cast<int>(std::find(std::begin(kSound), std::end(kSound), device.interface) - kSound);
}

bool isSameDevice(const ListedDevice& one, const ListedDevice& other) {
  if (one.isVideo != other.isVideo) return false;
  const std::string same = sameness(one);
  if (!same.empty() && same == sameness(other)) return true;
  const std::string node = property(one, "node.name");
  return !node.empty() && node == property(other, "node.name");
}

/// Hides entries of which a preferred interface lists the same device. Entries of one interface are different
/// devices even on the same card.
void hideDoubles(const std::vector<ListedDevice>& devices, std::vector<DeviceIdentity>& identities) {
  for (std::size_t i = 0; i < devices.size(); ++i) {
    for (std::size_t j = 0; j < devices.size() && !identities[i].hidden; ++j) {
      if (identities[j].hidden || preference(devices[j]) >= preference(devices[i])) continue;
      if (!isSameDevice(devices[i], devices[j])) continue;
      identities[i].hidden = true;
      identities[j].isDefault = identities[j].isDefault || identities[i].isDefault;
    }
  }
}

/// A suffix for an input of a card with several of them; none for its first.
std::string suffixOf(const ListedDevice& device) {
  if (device.isVideo) {
    const std::string index = property(device, kInputIndex);
    return index.empty() || index == "0" ? std::string() : "-video-index" + index;
  }
  const std::string input = firstOf(device, {"alsa.device", "device.profile.name"});
  return input.empty() || input == "0" ? std::string() : "-" + input;
}

void tellApart(const std::vector<ListedDevice>& devices, std::vector<DeviceIdentity>& identities) {
  std::map<std::string, std::vector<std::size_t>> groups;
  for (std::size_t i = 0; i < devices.size(); ++i) {
    if (!identities[i].hidden) groups[identities[i].uniqueID].push_back(i);
  }
  for (auto& [id, members] : groups) {
    if (members.size() < 2) continue;
    std::stable_sort(members.begin(), members.end(), [&](std::size_t one, std::size_t other) {
      return property(devices[one], "device.path") < property(devices[other], "device.path");
    });
    std::set<std::string> used;
    for (std::size_t place = 0; place < members.size(); ++place) {
      std::string unique = id + suffixOf(devices[members[place]]);
      // Nothing tells them apart but the order of their names.
      for (std::size_t number = place; !used.insert(unique).second; ++number)
        unique = id + "-input" + std::to_string(number);
      identities[members[place]].uniqueID = unique;
    }
  }
}

}  // namespace

std::vector<DeviceIdentity> identitiesOf(const std::vector<ListedDevice>& devices) {
  std::vector<DeviceIdentity> identities;
  for (const ListedDevice& device : devices) {
    const std::string physical = property(device, kPhysicalDevice);
    const std::string id = plainIdentifier(device);
    identities.push_back({.uniqueID = id,
                          .parent = physical.empty() ? placeOf(device) : physical,
                          .isReal = isReal(device),
                          .isDefault = property(device, "is-default") == "true",
                          .hidden = id.empty() || isNoCapture(device)});
  }
  hideDoubles(devices, identities);
  tellApart(devices, identities);
  return identities;
}

}  // namespace lmx
