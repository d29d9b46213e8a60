// Drops RTP packets in front of depayloaders.
#include "capture/gst/rtp_guard.h"

#include <gst/rtp/gstrtpbuffer.h>

#include <cstdlib>
#include <memory>
#include <span>
#include <string>

#include "capture/gst/gst_handles.h"
#include "capture/media/rtp_payload.h"
#include "platform/log.h"

namespace lmx {
namespace {

using Payload = std::span<const std::uint8_t>;

/// One depayloader's, on its streaming thread.
struct Guard {
  std::string depayloader;
  bool told = false;
};

/// A number that the camera's description gives as a text.
int number(const GstStructure* format, const char* field) {
  if (const char* text = gst_structure_get_string(format, field)) return std::atoi(text);
  int value = 0;
  return gst_structure_get_int(format, field, &value) != FALSE ? value : 0;
}

AccessUnitLayout layoutOf(const GstStructure* format) {
  return {.size = number(format, "sizelength"),
          .index = number(format, "indexlength"),
          .indexDelta = number(format, "indexdeltalength"),
          .ctsDelta = number(format, "ctsdeltalength"),
          .dtsDelta = number(format, "dtsdeltalength"),
          .randomAccess = number(format, "randomaccessindication") > 0 ? 1 : 0,
          .streamState = number(format, "streamstateindication"),
          .auxiliarySize = number(format, "auxiliarydatasizelength")};
}

bool harmlessPayload(GstPad* pad, const std::string& depayloader, Payload payload) {
  if (depayloader == "rtph264depay") return harmlessH264(payload);
  if (depayloader == "rtph265depay") return harmlessH265(payload);
  if (depayloader == "rtpjpegdepay") return harmlessJpeg(payload);
  if (depayloader != "rtpmp4gdepay") return !payload.empty();
  // Those that the depayloader has been given: a new description counts from the next packet on.
  const CapsHandle caps(gst_pad_get_current_caps(pad));
  return caps && harmlessAccessUnits(payload, layoutOf(gst_caps_get_structure(caps.get(), 0)));
}

bool harmless(GstPad* pad, Guard& guard, GstBuffer* buffer) {
  GstRTPBuffer packet = GST_RTP_BUFFER_INIT;
  if (gst_rtp_buffer_map(buffer, GST_MAP_READ, &packet) == FALSE) return false;
  const auto* begin = static_cast<const std::uint8_t*>(gst_rtp_buffer_get_payload(&packet));
  const Payload payload(begin, begin == nullptr ? 0 : gst_rtp_buffer_get_payload_len(&packet));
  const bool result = harmlessPayload(pad, guard.depayloader, payload);
  gst_rtp_buffer_unmap(&packet);
  if (!result && !guard.told) {
    LMPLogMessage(nullptr, kLogInfo, "The camera sends damaged packets; %s is not given them",
                  guard.depayloader.c_str());
    guard.told = true;
  }
  return result;
}

struct Packets {
  GstPad* pad;
  Guard& guard;
};

gboolean keepIfSound(GstBuffer** buffer, guint /*index*/, gpointer packets) noexcept {
  const auto& all = *static_cast<Packets*>(packets);
  if (!harmless(all.pad, all.guard, *buffer)) {
    gst_buffer_unref(*buffer);
    *buffer = nullptr;
  }
  return TRUE;
}

GstPadProbeReturn onPackets(GstPad* pad, GstPadProbeInfo* info, gpointer user) noexcept {
  auto& guard = *static_cast<Guard*>(user);
  if ((info->type & GST_PAD_PROBE_TYPE_BUFFER) != 0)
    return harmless(pad, guard, gst_pad_probe_info_get_buffer(info)) ? GST_PAD_PROBE_OK : GST_PAD_PROBE_DROP;
  GstBufferList* list = gst_buffer_list_make_writable(gst_pad_probe_info_get_buffer_list(info));
  info->data = list;
  Packets packets{pad, guard};
  gst_buffer_list_foreach(list, keepIfSound, &packets);
  return GST_PAD_PROBE_OK;
}

void onElement(GstBin* /*decoder*/, GstBin* /*parent*/, GstElement* element, gpointer /*unused*/) noexcept {
  GstElementFactory* factory = gst_element_get_factory(element);
  const std::string name = factory == nullptr ? "" : GST_OBJECT_NAME(factory);
  if (!name.starts_with("rtp") || !name.ends_with("depay")) return;
  const GstHandle<GstPad> sink(gst_element_get_static_pad(element, "sink"));
  if (!sink) return;
  constexpr auto kPackets =
      static_cast<GstPadProbeType>(GST_PAD_PROBE_TYPE_BUFFER | GST_PAD_PROBE_TYPE_BUFFER_LIST);
  auto guard = std::make_unique<Guard>(Guard{name});
  gst_pad_add_probe(sink.get(), kPackets, onPackets, guard.release(),
                    [](gpointer owned) { std::unique_ptr<Guard>(static_cast<Guard*>(owned)); });
}

}  // namespace

void guardDepayloadersIn(GstElement* decoder) {
  g_signal_connect(decoder, "deep-element-added", G_CALLBACK(&onElement), nullptr);
}

}  // namespace lmx
