// Changes caps on their way to parsers and decoders.
#include "capture/gst/stream_colours.h"

#include <string>

#include "capture/gst/gst_handles.h"

namespace lmx {
namespace {

constexpr const char* kFullRangeBT601 = "1:4:0:0";

GstPadProbeReturn onEvent(GstPad* /*pad*/, GstPadProbeInfo* info, gpointer /*unused*/) noexcept {
  GstEvent* event = gst_pad_probe_info_get_event(info);
  if (GST_EVENT_TYPE(event) != GST_EVENT_CAPS) return GST_PAD_PROBE_OK;
  GstCaps* stated = nullptr;
  gst_event_parse_caps(event, &stated);
  const CapsHandle caps(gst_caps_copy(stated));
  GstStructure* format = gst_caps_get_structure(caps.get(), 0);
  if (gst_structure_has_name(format, "image/jpeg") != FALSE) {
    gst_structure_set(format, "colorimetry", G_TYPE_STRING, kFullRangeBT601, nullptr);
  } else if (gst_structure_has_name(format, "video/x-h264") != FALSE ||
             gst_structure_has_name(format, "video/x-h265") != FALSE) {
    gst_structure_remove_field(format, "colorimetry");
  }
  info->data = gst_event_new_caps(caps.get());
  gst_event_unref(event);
  return GST_PAD_PROBE_OK;
}

void onElement(GstBin* /*decoder*/, GstBin* /*parent*/, GstElement* element, gpointer /*unused*/) noexcept {
  GstElementFactory* factory = gst_element_get_factory(element);
  const std::string name = factory == nullptr ? "" : GST_OBJECT_NAME(factory);
  // Behind the parsers the caps are those of the streams.
  if (name != "h264parse" && name != "h265parse" && name != "jpegparse") return;
  const GstHandle<GstPad> sink(gst_element_get_static_pad(element, "sink"));
  if (sink) correctColours(sink.get());
}

}  // namespace

void correctColours(GstPad* pad) {
  gst_pad_add_probe(pad, GST_PAD_PROBE_TYPE_EVENT_DOWNSTREAM, onEvent, nullptr, nullptr);
}

void correctColoursIn(GstElement* decoder) {
  g_signal_connect(decoder, "deep-element-added", G_CALLBACK(&onElement), nullptr);
}

}  // namespace lmx
