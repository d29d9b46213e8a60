// Reads the objects in which PipeWire describes formats. None of their sizes is believed.
#include "capture/source/pipewire_format.h"

#include <gst/video/video.h>
#include <spa/param/format.h>
#include <spa/param/video/raw.h>
#include <spa/param/video/type-info.h>
#include <spa/pod/iter.h>

#include <algorithm>
#include <climits>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

namespace lmx {
namespace {

constexpr std::size_t kMostValues = 256;  // of one property

/// The values of a property: one, several, or the ends of a range with the step between its members.
template <class Value>
struct Offer {
  std::vector<Value> values;
  bool isRange = false;
};

/// The values as they stand in memory, with their kind of choice.
template <class Value>
std::vector<Value> valuesIn(const spa_pod& pod, std::uint32_t type, std::uint32_t& choice) {
  const auto* bytes = reinterpret_cast<const std::byte*>(&pod) + sizeof pod;
  std::size_t size = pod.size;
  std::uint32_t member = pod.type;
  choice = SPA_CHOICE_None;
  if (pod.type == SPA_TYPE_Choice) {
    spa_pod_choice_body body;
    if (size < sizeof body) return {};
    std::memcpy(&body, bytes, sizeof body);
    choice = body.type;
    member = body.child.type;
    bytes += sizeof body;
    size -= sizeof body;
  }
  if (member != type) return {};
  std::vector<Value> values(std::min(size / sizeof(Value), kMostValues));
  if (!values.empty()) std::memcpy(values.data(), bytes, values.size() * sizeof(Value));
  return values;
}

template <class Value>
Offer<Value> offerOf(const spa_pod_object* format, std::uint32_t key, std::uint32_t type) {
  const spa_pod_prop* property = spa_pod_object_find_prop(format, nullptr, key);
  if (property == nullptr) return {};
  std::uint32_t choice = SPA_CHOICE_None;
  std::vector<Value> values = valuesIn<Value>(property->value, type, choice);
  if (values.empty()) return {};
  if (choice == SPA_CHOICE_None) return {{values.front()}};
  if (choice == SPA_CHOICE_Enum) {
    if (values.size() > 1) values.erase(values.begin());  // the default, which is among the others
    return {std::move(values)};
  }
  if ((choice != SPA_CHOICE_Range && choice != SPA_CHOICE_Step) || values.size() < 3) return {};
  values.erase(values.begin());
  if (choice == SPA_CHOICE_Range) values.resize(2);
  return {std::move(values), true};
}

GValue numberValue(std::int64_t number) {
  GValue value = G_VALUE_INIT;
  g_value_init(&value, G_TYPE_INT);
  g_value_set_int(&value, static_cast<int>(number));
  return value;
}

GValue rateValue(const spa_fraction& rate) {
  GValue value = G_VALUE_INIT;
  g_value_init(&value, GST_TYPE_FRACTION);
  gst_value_set_fraction(&value, static_cast<int>(rate.num), static_cast<int>(rate.denom));
  return value;
}

GValue textValue(const std::string& text) {
  GValue value = G_VALUE_INIT;
  g_value_init(&value, G_TYPE_STRING);
  g_value_set_string(&value, text.c_str());
  return value;
}

/// One value, or a list of several. Takes them.
void setField(GstStructure* structure, const char* field, std::vector<GValue> values) {
  if (values.empty()) return;
  if (values.size() == 1) return gst_structure_take_value(structure, field, &values.front());
  GValue list = G_VALUE_INIT;
  g_value_init(&list, GST_TYPE_LIST);
  for (GValue& value : values) gst_value_list_append_and_take_value(&list, &value);
  gst_structure_take_value(structure, field, &list);
}

bool isCount(std::int64_t number) { return number > 0 && number <= INT_MAX; }

void setNumbers(GstStructure* structure, const char* field, const Offer<std::int64_t>& offer) {
  std::vector<GValue> values;
  if (!offer.isRange) {
    for (const std::int64_t number : offer.values) {
      if (isCount(number)) values.push_back(numberValue(number));
    }
    return setField(structure, field, std::move(values));
  }
  const int low = static_cast<int>(std::clamp<std::int64_t>(offer.values[0], 1, INT_MAX));
  const int high = static_cast<int>(std::clamp<std::int64_t>(offer.values[1], 1, INT_MAX));
  if (low == high) return setField(structure, field, {numberValue(low)});
  if (low > high) return;
  int step = offer.values.size() > 2 && isCount(offer.values[2]) ? static_cast<int>(offer.values[2]) : 1;
  if (low % step != 0 || high % step != 0) step = 1;  // GStreamer knows no such range
  GValue range = G_VALUE_INIT;
  g_value_init(&range, GST_TYPE_INT_RANGE);
  gst_value_set_int_range_step(&range, low, high, step);
  gst_structure_take_value(structure, field, &range);
}

void setNumbers(GstStructure* structure, const char* field, const spa_pod_object* format, std::uint32_t key) {
  const auto offer = offerOf<std::int32_t>(format, key, SPA_TYPE_Int);
  setNumbers(structure, field, {{offer.values.begin(), offer.values.end()}, offer.isRange});
}

bool isRate(const spa_fraction& rate) { return rate.num <= INT_MAX && isCount(rate.denom); }

bool isLess(const spa_fraction& one, const spa_fraction& other) {
  return std::uint64_t{one.num} * other.denom < std::uint64_t{other.num} * one.denom;
}

void setRates(GstStructure* structure, const spa_pod_object* format) {
  const auto offer = offerOf<spa_fraction>(format, SPA_FORMAT_VIDEO_framerate, SPA_TYPE_Fraction);
  if (offer.isRange && isRate(offer.values[0]) && isRate(offer.values[1]) &&
      isLess(offer.values[0], offer.values[1])) {
    const GValue low = rateValue(offer.values[0]);
    const GValue high = rateValue(offer.values[1]);
    GValue range = G_VALUE_INIT;
    g_value_init(&range, GST_TYPE_FRACTION_RANGE);
    gst_value_set_fraction_range(&range, &low, &high);
    return gst_structure_take_value(structure, "framerate", &range);
  }
  std::vector<GValue> values;
  const std::size_t count = offer.isRange ? 1 : offer.values.size();
  for (std::size_t i = 0; i < count; ++i) {
    if (isRate(offer.values[i])) values.push_back(rateValue(offer.values[i]));
  }
  setField(structure, "framerate", std::move(values));
}

/// PipeWire's names of formats are GStreamer's; empty for those that GStreamer doesn't know.
std::string pictureFormat(std::uint32_t id) {
  for (const spa_type_info* info = spa_type_video_format; info->name != nullptr; ++info) {
    if (info->type != id) continue;
    const std::string_view name(info->name);
    const std::string text(name.substr(name.rfind(':') + 1));
    return gst_video_format_from_string(text.c_str()) == GST_VIDEO_FORMAT_UNKNOWN ? std::string() : text;
  }
  return {};
}

std::string interlacing(std::uint32_t id) {
  static constexpr const char* kNames[] = {"progressive", "interleaved", "mixed", "fields"};
  return id < std::size(kNames) ? kNames[id] : "";
}

template <class Name>
void setNames(GstStructure* structure, const char* field, const spa_pod_object* format, std::uint32_t key,
              const Name& name) {
  std::vector<GValue> values;
  for (const std::uint32_t id : offerOf<std::uint32_t>(format, key, SPA_TYPE_Id).values) {
    if (const std::string text = name(id); !text.empty()) values.push_back(textValue(text));
  }
  setField(structure, field, std::move(values));
}

/// Adds the structure once for each size.
void addSizes(GstCaps* caps, const GstStructure* structure, const spa_pod_object* format) {
  const auto offer = offerOf<spa_rectangle>(format, SPA_FORMAT_VIDEO_size, SPA_TYPE_Rectangle);
  std::vector<Offer<std::int64_t>> widths(offer.isRange ? 1 : offer.values.size());
  auto heights = widths;
  for (std::size_t i = 0; i < offer.values.size(); ++i) {
    const std::size_t place = offer.isRange ? 0 : i;
    widths[place].values.push_back(offer.values[i].width);
    heights[place].values.push_back(offer.values[i].height);
    widths[place].isRange = heights[place].isRange = offer.isRange;
  }
  const bool onCard = spa_pod_object_find_prop(format, nullptr, SPA_FORMAT_VIDEO_modifier) != nullptr;
  for (std::size_t i = 0; i < widths.size(); ++i) {
    GstStructure* one = gst_structure_copy(structure);
    setNumbers(one, "width", widths[i]);
    setNumbers(one, "height", heights[i]);
    gst_caps_append_structure_full(caps, one,
                                   onCard ? gst_caps_features_new("memory:DMABuf", nullptr) : nullptr);
  }
}

CapsHandle pictures(const spa_pod_object* format, std::uint32_t subtype) {
  const char* name = subtype == SPA_MEDIA_SUBTYPE_raw    ? "video/x-raw"
                     : subtype == SPA_MEDIA_SUBTYPE_mjpg ? "image/jpeg"
                     : subtype == SPA_MEDIA_SUBTYPE_h264 ? "video/x-h264"
                                                         : nullptr;
  if (name == nullptr) return nullptr;
  GstStructure* structure = gst_structure_new_empty(name);
  if (subtype == SPA_MEDIA_SUBTYPE_raw) {
    setNames(structure, "format", format, SPA_FORMAT_VIDEO_format, pictureFormat);
    setNames(structure, "interlace-mode", format, SPA_FORMAT_VIDEO_interlaceMode, interlacing);
  }
  setRates(structure, format);
  CapsHandle caps(gst_caps_new_empty());
  const bool readable =
      subtype != SPA_MEDIA_SUBTYPE_raw || gst_structure_has_field(structure, "format") != FALSE;
  if (readable) addSizes(caps.get(), structure, format);
  gst_structure_free(structure);
  return caps;
}

CapsHandle sound(const spa_pod_object* format, std::uint32_t subtype) {
  if (subtype != SPA_MEDIA_SUBTYPE_raw) return nullptr;
  CapsHandle caps(gst_caps_new_empty_simple("audio/x-raw"));
  GstStructure* structure = gst_caps_get_structure(caps.get(), 0);
  setNumbers(structure, "rate", format, SPA_FORMAT_AUDIO_rate);
  setNumbers(structure, "channels", format, SPA_FORMAT_AUDIO_channels);
  return caps;
}

}  // namespace

CapsHandle capsOfFormat(const spa_pod* format) {
  if (format == nullptr || format->type != SPA_TYPE_Object || format->size < sizeof(spa_pod_object_body))
    return nullptr;
  const auto* object = reinterpret_cast<const spa_pod_object*>(format);
  if (object->body.type != SPA_TYPE_OBJECT_Format) return nullptr;
  const auto type = offerOf<std::uint32_t>(object, SPA_FORMAT_mediaType, SPA_TYPE_Id);
  const auto subtype = offerOf<std::uint32_t>(object, SPA_FORMAT_mediaSubtype, SPA_TYPE_Id);
  if (type.values.size() != 1 || subtype.values.size() != 1) return nullptr;
  CapsHandle caps;
  if (type.values[0] == SPA_MEDIA_TYPE_video) caps = pictures(object, subtype.values[0]);
  if (type.values[0] == SPA_MEDIA_TYPE_audio) caps = sound(object, subtype.values[0]);
  if (caps && gst_caps_is_empty(caps.get()) != FALSE) return nullptr;
  return caps;
}

}  // namespace lmx
