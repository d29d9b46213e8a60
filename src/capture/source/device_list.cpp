// Chooses default devices and describes devices in words.
#include "capture/source/device_list.h"

#include <algorithm>
#include <map>
#include <set>

#include "support/format.h"

namespace lmx {
namespace {

using Numbers = std::set<double, std::greater<>>;

double numberFrom(const GValue* value) {
  if (GST_VALUE_HOLDS_FRACTION(value)) {
    const int denominator = std::max(1, gst_value_get_fraction_denominator(value));
    return static_cast<double>(gst_value_get_fraction_numerator(value)) / denominator;
  }
  return G_VALUE_HOLDS_INT(value) ? g_value_get_int(value) : 0;
}

/// The values of a field: a single one, those of a list, or both ends of a range.
Numbers numbersOf(const GstStructure* structure, const char* field) {
  const GValue* value = gst_structure_get_value(structure, field);
  Numbers numbers;
  if (value == nullptr) return numbers;
  if (GST_VALUE_HOLDS_LIST(value)) {
    for (guint i = 0; i < gst_value_list_get_size(value); ++i)
      numbers.insert(numberFrom(gst_value_list_get_value(value, i)));
  } else if (GST_VALUE_HOLDS_INT_RANGE(value)) {
    numbers = {static_cast<double>(gst_value_get_int_range_min(value)),
               static_cast<double>(gst_value_get_int_range_max(value))};
  } else if (GST_VALUE_HOLDS_FRACTION_RANGE(value)) {
    numbers = {numberFrom(gst_value_get_fraction_range_min(value)),
               numberFrom(gst_value_get_fraction_range_max(value))};
  } else {
    numbers.insert(numberFrom(value));
  }
  return numbers;
}

double largest(const Numbers& numbers) { return numbers.empty() ? 0 : *numbers.begin(); }

std::string joined(const Numbers& numbers) {
  std::string text;
  for (const double number : numbers) {
    if (number > 0) text += string_with_format(text.empty() ? "%.5g" : "/%.5g", number);
  }
  return text;
}

std::string entryOf(const HardwareDevice& device, bool isDefault) {
  return "  " + device.uniqueID + (isDefault ? "   <- Automatic" : "") + "\n    name:       " + device.name +
         (device.isReal ? "" : " (made up by a program, never Automatic)") + "\n" +
         (device.formats.empty() ? "" : "    formats:    " + device.formats + "\n");
}

std::string modeLine(const HardwareDevice& camera, const CameraDemand& demand) {
  if (camera.modes.empty()) return "    mode:       left to the camera, which tells none\n";
  const auto mode = chooseMode(camera.modes, demand);
  if (!mode) return "    mode:       none that this machine can decode\n";
  return "    mode:       " + describe(*mode) + " (" + reasonFor(*mode, camera.modes, demand) + ")\n";
}

std::string microphoneLine(const std::vector<HardwareDevice>& devices, const HardwareDevice& camera) {
  const auto microphone = microphoneFor(devices, camera.uniqueID);
  if (!microphone.uniqueID) return {};
  return "    microphone: " + *microphone.uniqueID +
         (microphone.isMuxedAudioOfVideoDevice ? " (its own)" : "") + "\n";
}

/// What "Automatic" takes, and why.
std::string automaticLine(const std::vector<HardwareDevice>& devices, bool video) {
  const HardwareDevice* first = firstDevice(devices, video);
  if (first == nullptr) return "  Automatic finds no hardware to choose\n";
  const auto rivals = std::count_if(devices.begin(), devices.end(),
                                    [video](const auto& d) { return d.isVideo == video && d.isReal; });
  const char* reason = "the only one that is hardware";
  if (rivals > 1) reason = first->isDefault ? "the sound server's default" : "the first that is hardware";
  return "  Automatic takes " + first->uniqueID + ": " + reason + "\n";
}

}  // namespace

std::string formatsText(const GstCaps* caps, bool video) {
  using Key = std::pair<double, double>;  // width and height, or the sample rate and nothing
  std::map<Key, Numbers, std::greater<>> rates;
  for (guint i = 0; caps != nullptr && i < gst_caps_get_size(caps); ++i) {
    const GstStructure* structure = gst_caps_get_structure(caps, i);
    const Key key = video
                        ? Key(largest(numbersOf(structure, "width")), largest(numbersOf(structure, "height")))
                        : Key(largest(numbersOf(structure, "rate")), 0);
    if (key.first == 0) continue;
    rates[key].merge(numbersOf(structure, video ? "framerate" : "channels"));
  }
  std::string text;
  for (const auto& [key, numbers] : rates) {
    const std::string second = joined(numbers);
    if (!text.empty()) text += ", ";
    text += video ? string_with_format("%.0fx%.0f", key.first, key.second)
                  : string_with_format("%.0f Hz", key.first);
    if (!second.empty()) text += video ? " at " + second + " fps" : " with " + second + " channels";
  }
  return text;
}

const HardwareDevice* firstDevice(const std::vector<HardwareDevice>& devices, bool video) {
  const auto found = std::find_if(devices.begin(), devices.end(),
                                  [video](const auto& d) { return d.isVideo == video && d.isReal; });
  return found == devices.end() ? nullptr : &*found;
}

CaptureCatalog::PreferredAudio microphoneFor(const std::vector<HardwareDevice>& devices,
                                             const std::string& cameraID) {
  const auto camera = std::find_if(devices.begin(), devices.end(),
                                   [&](const auto& d) { return d.isVideo && d.uniqueID == cameraID; });
  if (camera != devices.end() && !camera->parent.empty()) {
    const auto own = std::find_if(devices.begin(), devices.end(),
                                  [&](const auto& d) { return !d.isVideo && d.parent == camera->parent; });
    if (own != devices.end()) return {own->uniqueID, true};
  }
  const HardwareDevice* first = firstDevice(devices, false);
  if (first == nullptr) return {};
  return {first->uniqueID, false};
}

std::string deviceListText(const std::vector<HardwareDevice>& devices, const CameraDemand& demand) {
  const auto entries = [&](bool video) {
    std::string text;
    for (const HardwareDevice& device : devices) {
      if (device.isVideo != video) continue;
      text += entryOf(device, &device == firstDevice(devices, video));
      if (video) text += modeLine(device, demand) + microphoneLine(devices, device);
    }
    return text + automaticLine(devices, video);
  };
  return "Cameras (video; for RecordingVideoInput)\n" + entries(true) +
         "  test://video             synthetic, never Automatic; test://video?size=640x360 for another size\n"
         "  file:///PATH/MOVIE       a movie played in real time, with its sound, over and over\n"
         "  rtsp://HOST/PATH         a network camera, with its sound\n"
         "  pipewire:NODE            any output of PipeWire, by its node.name\n"
         "\nMicrophones (audio; for RecordingAudioInput)\n" +
         entries(false) +
         "  test://audio             synthetic, never Automatic\n"
         "  alsa:device=NAME         a PCM of ALSA's own configuration\n"
         "  pipewire:NODE            any output of PipeWire, by its node.name\n";
}

}  // namespace lmx
