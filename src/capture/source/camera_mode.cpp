// Expands the caps of cameras into modes and ranks them.
#include "capture/source/camera_mode.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <tuple>

#include "support/format.h"

namespace lmx {
namespace {

constexpr double kFluent = 23.97;    // frames a second that are enough: those of a film
constexpr double kJerky = 10;        // fewer are taken only where there is nothing else
constexpr double kRounding = 1.001;  // drivers write 30 as 10000000/333333

double perSecond(FrameRate rate) {
  return static_cast<double>(rate.numerator) / std::max(1, rate.denominator);
}

// ---- out of caps

struct Numbers {
  int low, high, step;
};
struct Rates {
  FrameRate low, high;
};

FrameRate fraction(const GValue* value) {
  return {gst_value_get_fraction_numerator(value), gst_value_get_fraction_denominator(value)};
}

/// Calls `one` with each value of a field: the field itself or the members of its list.
template <class Function>
void eachValue(const GValue* value, const Function& one) {
  if (value == nullptr) return;
  if (!GST_VALUE_HOLDS_LIST(value)) return one(value);
  for (guint i = 0; i < gst_value_list_get_size(value); ++i)
    eachValue(gst_value_list_get_value(value, i), one);
}

std::vector<Numbers> numbersOf(const GstStructure* structure, const char* field) {
  std::vector<Numbers> numbers;
  eachValue(gst_structure_get_value(structure, field), [&](const GValue* value) {
    if (G_VALUE_HOLDS_INT(value)) {
      numbers.push_back({g_value_get_int(value), g_value_get_int(value), 1});
    } else if (GST_VALUE_HOLDS_INT_RANGE(value)) {
      numbers.push_back({gst_value_get_int_range_min(value), gst_value_get_int_range_max(value),
                         gst_value_get_int_range_step(value)});
    }
  });
  std::erase_if(numbers, [](const Numbers& n) { return n.high <= 0; });
  return numbers;
}

std::vector<Rates> ratesOf(const GstStructure* structure) {
  std::vector<Rates> rates;
  eachValue(gst_structure_get_value(structure, "framerate"), [&](const GValue* value) {
    if (GST_VALUE_HOLDS_FRACTION(value)) {
      rates.push_back({fraction(value), fraction(value)});
    } else if (GST_VALUE_HOLDS_FRACTION_RANGE(value)) {
      rates.push_back({fraction(gst_value_get_fraction_range_min(value)),
                       fraction(gst_value_get_fraction_range_max(value))});
    }
  });
  if (rates.empty()) rates.push_back({{0, 1}, {0, 1}});
  return rates;
}

std::vector<std::string> textsOf(const GstStructure* structure, const char* field) {
  std::vector<std::string> texts;
  eachValue(gst_structure_get_value(structure, field), [&](const GValue* value) {
    if (G_VALUE_HOLDS_STRING(value)) texts.emplace_back(g_value_get_string(value));
  });
  return texts;
}

std::optional<CameraCoding> codingOf(const GstStructure* structure) {
  if (gst_structure_has_name(structure, "video/x-raw") != FALSE) return CameraCoding::raw;
  if (gst_structure_has_name(structure, "image/jpeg") != FALSE) return CameraCoding::jpeg;
  if (gst_structure_has_name(structure, "video/x-h264") != FALSE) return CameraCoding::h264;
  return std::nullopt;
}

void addModes(const GstStructure* structure, CameraCoding coding, std::vector<CameraMode>& modes) {
  std::vector<std::string> formats;
  if (coding == CameraCoding::raw) formats = textsOf(structure, "format");
  if (formats.empty()) formats.emplace_back();
  const auto interlacing = textsOf(structure, "interlace-mode");
  CameraMode mode{.coding = coding};
  mode.interlaced = !interlacing.empty() &&
                    std::find(interlacing.begin(), interlacing.end(), "progressive") == interlacing.end();
  for (const std::string& format : formats) {
    mode.format = format;
    for (const Numbers& width : numbersOf(structure, "width")) {
      for (const Numbers& height : numbersOf(structure, "height")) {
        mode.smallest = {width.low, height.low};
        mode.size = {width.high, height.high};
        mode.step = {width.step, height.step};
        for (const Rates& rates : ratesOf(structure)) {
          mode.slowest = rates.low;
          mode.rate = rates.high;
          modes.push_back(mode);
        }
      }
    }
  }
}

// ---- choice

/// A side of the picture within a range: as wanted, or the nearest there is.
int sideWithin(int low, int high, int step, int wanted) {
  if (wanted >= high) return high;
  return wanted <= low ? low : low + (wanted - low) / std::max(1, step) * std::max(1, step);
}

/// The mode with one size and rate, the best for that demand.
CameraMode settled(CameraMode mode, const CameraDemand& demand) {
  mode.size = {sideWithin(mode.smallest.width, mode.size.width, mode.step.width, demand.size.width),
               sideWithin(mode.smallest.height, mode.size.height, mode.step.height, demand.size.height)};
  mode.smallest = mode.size;
  const bool range = !(mode.rate == mode.slowest);
  if (range && perSecond(mode.rate) > demand.maximumRate * kRounding)
    mode.rate =
        perSecond(mode.slowest) > demand.maximumRate ? mode.slowest : frameRateFrom(demand.maximumRate);
  mode.slowest = mode.rate;
  return mode;
}

/// Pixels that count in a picture: those of the largest part that has the wanted shape, up to the wanted
/// size.
double pixels(const CameraMode& mode, const CameraDemand& demand) {
  const double scale = std::min({1.0, static_cast<double>(mode.size.width) / demand.size.width,
                                 static_cast<double>(mode.size.height) / demand.size.height});
  return std::round(scale * demand.size.width) * std::round(scale * demand.size.height);
}

/// Frames a second that count. An unknown rate is taken to be enough.
double frames(const CameraMode& mode, const CameraDemand& demand) {
  const double enough = std::min(kFluent, demand.maximumRate);
  const double rate = perSecond(mode.rate);
  return rate <= 0 || rate * kRounding >= enough ? enough : rate;
}

bool isJerky(const CameraMode& mode, const CameraDemand& demand) {
  return frames(mode, demand) * kRounding < std::min(kJerky, demand.maximumRate);
}

bool isTooFast(const CameraMode& mode, const CameraDemand& demand) {
  return perSecond(mode.rate) > demand.maximumRate * kRounding;
}

bool isGrey(const CameraMode& mode) { return mode.format.rfind("GRAY", 0) == 0; }

/// Effort of converting a raw format; the formats of most cameras are listed.
std::size_t effort(const CameraMode& mode) {
  static constexpr std::array kCheap = {"",     "I420", "YV12", "NV12", "NV21",
                                        "YUY2", "UYVY", "YVYU", "VYUY", "Y42B"};
  return static_cast<std::size_t>(std::find(kCheap.begin(), kCheap.end(), mode.format) - kCheap.begin());
}

/// What is compared from left to right; the smaller is the better one.
auto rank(const CameraMode& mode, const CameraDemand& demand) {
  return std::tuple(isGrey(mode), isJerky(mode, demand), -pixels(mode, demand) * frames(mode, demand),
                    mode.size.width * static_cast<double>(mode.size.height), mode.interlaced,
                    isTooFast(mode, demand), mode.coding, effort(mode),
                    std::abs(perSecond(mode.rate) - demand.maximumRate));
}

bool usable(const CameraMode& mode, const CameraDemand& demand) {
  if (mode.coding == CameraCoding::jpeg) return demand.decodesJPEG;
  return mode.coding != CameraCoding::h264 || demand.decodesH264;
}

// ---- words

const char* nameOf(CameraCoding coding) {
  switch (coding) {
    case CameraCoding::jpeg:
      return "JPEG";
    case CameraCoding::h264:
      return "H.264";
    case CameraCoding::raw:
      break;
  }
  return "raw";
}

std::string sizeText(PictureSize size) { return string_with_format("%dx%d", size.width, size.height); }

/// What a coding that is preferred to the chosen one would give: why it was not taken. Empty when the camera
/// doesn't offer it.
std::string shortcoming(CameraCoding coding, const CameraMode& chosen, const std::vector<CameraMode>& modes,
                        const CameraDemand& demand) {
  std::vector<CameraMode> rivals;
  for (const CameraMode& mode : modes) {
    if (mode.coding == coding) rivals.push_back(settled(mode, demand));
  }
  if (rivals.empty()) return {};
  if (!usable(rivals.front(), demand)) return string_with_format("%s can't be decoded here", nameOf(coding));
  if (std::all_of(rivals.begin(), rivals.end(), isGrey))
    return string_with_format("%s is grey", nameOf(coding));
  double fastest = 0;
  for (const CameraMode& rival : rivals) {
    if (pixels(rival, demand) >= pixels(chosen, demand)) fastest = std::max(fastest, perSecond(rival.rate));
  }
  if (fastest > 0) return string_with_format("%s gives %.5g fps at that size", nameOf(coding), fastest);
  const auto largest = std::max_element(
      rivals.begin(), rivals.end(),
      [&](const auto& one, const auto& other) { return pixels(one, demand) < pixels(other, demand); });
  return string_with_format("%s gives %s at most", nameOf(coding), sizeText(largest->size).c_str());
}

}  // namespace

std::vector<CameraMode> offeredModes(const GstCaps* caps) {
  std::vector<CameraMode> modes;
  if (caps == nullptr || gst_caps_is_any(caps) != FALSE) return modes;
  for (guint i = 0; i < gst_caps_get_size(caps); ++i) {
    const GstStructure* structure = gst_caps_get_structure(caps, i);
    // Pictures on a graphics card need elements that not every machine has.
    if (gst_caps_features_is_equal(gst_caps_get_features(caps, i), GST_CAPS_FEATURES_MEMORY_SYSTEM_MEMORY) ==
        FALSE)
      continue;
    if (const auto coding = codingOf(structure)) addModes(structure, *coding, modes);
  }
  return modes;
}

std::optional<CameraMode> chooseMode(const std::vector<CameraMode>& modes, const CameraDemand& demand) {
  std::optional<CameraMode> best;
  for (const CameraMode& offered : modes) {
    if (!usable(offered, demand)) continue;
    const CameraMode mode = settled(offered, demand);
    if (!best || rank(mode, demand) < rank(*best, demand)) best = mode;
  }
  return best;
}

CapsHandle capsOf(const CameraMode& mode) {
  static constexpr const char* kNames[] = {"video/x-raw", "image/jpeg", "video/x-h264"};
  CapsHandle caps(gst_caps_new_simple(kNames[static_cast<int>(mode.coding)], "width", G_TYPE_INT,
                                      mode.size.width, "height", G_TYPE_INT, mode.size.height, nullptr));
  if (!mode.format.empty())
    gst_caps_set_simple(caps.get(), "format", G_TYPE_STRING, mode.format.c_str(), nullptr);
  if (mode.rate.numerator > 0) {
    gst_caps_set_simple(caps.get(), "framerate", GST_TYPE_FRACTION, mode.rate.numerator,
                        mode.rate.denominator, nullptr);
  }
  return caps;
}

std::string describe(const CameraMode& mode) {
  std::string text = sizeText(mode.size);
  if (mode.rate.numerator > 0) text += string_with_format(" at %.5g fps", perSecond(mode.rate));
  text += string_with_format(", %s", nameOf(mode.coding));
  if (!mode.format.empty()) text += " " + mode.format;
  return text + (mode.interlaced ? ", interlaced" : "");
}

std::string reasonFor(const CameraMode& chosen, const std::vector<CameraMode>& modes,
                      const CameraDemand& demand) {
  const bool whole = pixels(chosen, demand) >= pixels(CameraMode{.size = demand.size}, demand);
  std::string text = whole ? "the smallest that gives " + sizeText(demand.size) : "the most the camera gives";
  if (isTooFast(chosen, demand))
    text += string_with_format("; no rate at or below %.5g fps", demand.maximumRate);
  for (const CameraCoding preferred : {CameraCoding::raw, CameraCoding::jpeg}) {
    if (preferred >= chosen.coding) break;
    const std::string weakness = shortcoming(preferred, chosen, modes, demand);
    if (!weakness.empty()) text += "; " + weakness;
  }
  return text;
}

}  // namespace lmx
