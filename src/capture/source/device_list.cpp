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
    if (number > 0) text += (text.empty() ? "" : "/") + string_with_format("%.5g", number);
  }
  return text;
}

std::string nameOf(const HardwareDevice& device, bool isDefault) {
  return "  " + device.uniqueID + (isDefault ? "   <- Automatic" : "") + "\n    name:       " + device.name +
         "\n" + (device.formats.empty() ? "" : "    formats:    " + device.formats + "\n");
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
  const auto found =
      std::find_if(devices.begin(), devices.end(), [video](const auto& d) { return d.isVideo == video; });
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

std::string deviceListText(const std::vector<HardwareDevice>& devices) {
  std::string text = "Cameras (video; for RecordingVideoInput)\n";
  for (const HardwareDevice& device : devices) {
    if (!device.isVideo) continue;
    text += nameOf(device, &device == firstDevice(devices, true));
    const auto microphone = microphoneFor(devices, device.uniqueID);
    if (!microphone.uniqueID) continue;
    text += "    microphone: " + *microphone.uniqueID +
            (microphone.isMuxedAudioOfVideoDevice ? " (its own)" : "") + "\n";
  }
  if (firstDevice(devices, true) == nullptr) text += "  none found: Automatic has nothing to choose\n";
  text +=
      "  test://video             synthetic, never Automatic; test://video?size=640x360 for another size\n"
      "  file:///PATH/MOVIE       a movie played in real time, with its sound, over and over\n"
      "\nMicrophones (audio; for RecordingAudioInput)\n";
  for (const HardwareDevice& device : devices) {
    if (!device.isVideo) text += nameOf(device, &device == firstDevice(devices, false));
  }
  if (firstDevice(devices, false) == nullptr) text += "  none found: Automatic has nothing to choose\n";
  return text + "  test://audio             synthetic, never Automatic\n";
}

}  // namespace lmx
