// Drops JPEG pictures in front of decoders.
#include "capture/gst/jpeg_guard.h"

#include <memory>
#include <string_view>

#include "capture/gst/gst_handles.h"
#include "capture/media/jpeg_picture.h"
#include "platform/log.h"

namespace lmx {
namespace {

/// One decoder's, on its streaming thread.
struct Guard {
  bool told = false;
};

int stated(const GstCaps* caps, const char* field) {
  int value = 0;
  if (caps != nullptr) gst_structure_get_int(gst_caps_get_structure(caps, 0), field, &value);
  return value;
}

bool harmless(GstPad* pad, GstBuffer* buffer) {
  const CapsHandle caps(gst_pad_get_current_caps(pad));
  GstMapInfo bytes;
  if (gst_buffer_map(buffer, &bytes, GST_MAP_READ) == FALSE) return false;
  const bool result = harmlessJpegPicture({bytes.data, bytes.size}, stated(caps.get(), "width"),
                                          stated(caps.get(), "height"));
  gst_buffer_unmap(buffer, &bytes);
  return result;
}

GstPadProbeReturn onPicture(GstPad* pad, GstPadProbeInfo* info, gpointer user) noexcept {
  if (harmless(pad, gst_pad_probe_info_get_buffer(info))) return GST_PAD_PROBE_OK;
  auto& guard = *static_cast<Guard*>(user);
  if (!guard.told)
    LMPLogMessage(nullptr, kLogInfo, "The camera sends damaged JPEG pictures; they are left out");
  guard.told = true;
  return GST_PAD_PROBE_DROP;
}

void onElement(GstBin* /*bin*/, GstBin* /*parent*/, GstElement* element, gpointer /*unused*/) noexcept {
  GstElementFactory* factory = gst_element_get_factory(element);
  if (factory == nullptr || std::string_view(GST_OBJECT_NAME(factory)) != "jpegdec") return;
  const GstHandle<GstPad> sink(gst_element_get_static_pad(element, "sink"));
  if (!sink) return;
  gst_pad_add_probe(sink.get(), GST_PAD_PROBE_TYPE_BUFFER, onPicture, std::make_unique<Guard>().release(),
                    [](gpointer owned) { std::unique_ptr<Guard>(static_cast<Guard*>(owned)); });
}

}  // namespace

void guardJpegDecodersIn(GstElement* bin) {
  g_signal_connect(bin, "deep-element-added", G_CALLBACK(&onElement), nullptr);
}

}  // namespace lmx
