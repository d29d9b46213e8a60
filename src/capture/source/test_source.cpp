// Pad probes that draw, correct the sound and simulate faults.
#include "capture/source/test_source.h"

#include <gst/audio/audio.h>
#include <gst/video/video.h>

#include <cstring>
#include <memory>

#include "capture/gst/gst_handles.h"
#include "capture/source/test_picture.h"

namespace lmx {
namespace {

struct Probe {
  DeviceID id;
  bool video = false;
  double frameSeconds = 0;
};

GstPadProbeReturn playFault(GstPad* pad, const Probe& probe, double seconds) {
  const auto after = [&](const char* option) {
    const auto limit = probe.id.seconds(option);
    return limit && seconds >= *limit;
  };
  if (after("lost-after")) {
    const GstHandle<GstElement> source(gst_pad_get_parent_element(pad));
    GST_ELEMENT_ERROR(source.get(), RESOURCE, NOT_FOUND, ("the synthetic device was unplugged"), (nullptr));
    return GST_PAD_PROBE_DROP;
  }
  if (after("eos-after")) {
    gst_pad_push_event(pad, gst_event_new_eos());
    return GST_PAD_PROBE_DROP;
  }
  return after("silent-after") ? GST_PAD_PROBE_DROP : GST_PAD_PROBE_OK;
}

void draw(GstBuffer* buffer, const Probe& probe) {
  const PictureSize size = pictureSize(probe.id);
  GstVideoInfo info;
  gst_video_info_set_format(&info, GST_VIDEO_FORMAT_I420, static_cast<guint>(size.width),
                            static_cast<guint>(size.height));
  GstVideoFrame frame;
  if (gst_video_frame_map(&frame, &info, buffer, GST_MAP_WRITE) == FALSE) return;
  const int stride = GST_VIDEO_FRAME_PLANE_STRIDE(&frame, 0);
  const LumaPlane plane{{static_cast<std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&frame, 0)),
                         static_cast<std::size_t>(stride) * static_cast<std::size_t>(size.height)},
                        size.width,
                        size.height,
                        stride};
  const auto number = static_cast<std::uint32_t>(GST_BUFFER_OFFSET(buffer));
  drawFrameNumber(plane, number);
  drawClock(plane, clockText(number * probe.frameSeconds));
  for (const guint component : {1U, 2U}) {
    // No colour behind the bit row and the clock, so that people can read them, too.
    const int width = size.width / 2;
    const int height = size.height / 2;
    const int step = GST_VIDEO_FRAME_PLANE_STRIDE(&frame, component);
    auto* chroma = static_cast<std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&frame, component));
    for (int row = 0; row < height; ++row) {
      const bool grey = row < height / 18 || row > height - height / 6;
      if (grey)
        std::memset(chroma + static_cast<std::ptrdiff_t>(row) * step, 128, static_cast<std::size_t>(width));
    }
  }
  gst_video_frame_unmap(&frame);
}

/// Silences what lies between the ticks. The source leaves the first sample of a tick uninitialised: it may
/// be louder than any sound.
void clearBetweenTicks(GstPad* pad, GstBuffer* buffer) {
  const CapsHandle caps(gst_pad_get_current_caps(pad));
  GstAudioInfo format;
  if (!caps || gst_audio_info_from_caps(&format, caps.get()) == FALSE) return;
  GstMapInfo map;
  if (gst_buffer_map(buffer, &map, GST_MAP_WRITE) == FALSE) return;
  const auto rate = static_cast<std::uint64_t>(format.rate);
  const auto frameSize = static_cast<std::size_t>(format.bpf);
  const std::uint64_t first = GST_BUFFER_OFFSET(buffer);
  for (std::size_t i = 0; (i + 1) * frameSize <= map.size; ++i) {
    // A tick fills the last hundredth of a second and begins with a zero.
    if ((first + i) % rate <= rate - rate / 100) std::memset(map.data + i * frameSize, 0, frameSize);
  }
  gst_buffer_unmap(buffer, &map);
}

GstPadProbeReturn onBuffer(GstPad* pad, GstPadProbeInfo* info, gpointer user) noexcept {
  const auto& probe = *static_cast<Probe*>(user);
  GstBuffer* buffer = GST_PAD_PROBE_INFO_BUFFER(info);
  const double seconds = static_cast<double>(GST_BUFFER_PTS(buffer)) / 1e9;
  const GstPadProbeReturn fault = playFault(pad, probe, seconds);
  if (fault != GST_PAD_PROBE_OK) return fault;
  buffer = gst_buffer_make_writable(buffer);
  GST_PAD_PROBE_INFO_DATA(info) = buffer;
  if (!probe.video) {
    clearBetweenTicks(pad, buffer);
    return GST_PAD_PROBE_OK;
  }
  Probe timed = probe;
  timed.frameSeconds = static_cast<double>(GST_BUFFER_DURATION(buffer)) / 1e9;
  draw(buffer, timed);
  return GST_PAD_PROBE_OK;
}

void attach(GstElement* pipeline, const char* source, const DeviceID& id, bool video) {
  const GstHandle<GstElement> element = elementNamed(pipeline, source);
  if (!element) return;
  const GstHandle<GstPad> pad(gst_element_get_static_pad(element.get(), "src"));
  auto probe = std::make_unique<Probe>(Probe{.id = id, .video = video});
  gst_pad_add_probe(pad.get(), GST_PAD_PROBE_TYPE_BUFFER, onBuffer, probe.release(),
                    [](gpointer user) { std::unique_ptr<Probe>(static_cast<Probe*>(user)); });
}

}  // namespace

void attachTestPicture(GstElement* pipeline, const DeviceID& id) { attach(pipeline, "vsource", id, true); }
void attachTestSound(GstElement* pipeline, const DeviceID& id) { attach(pipeline, "asource", id, false); }

}  // namespace lmx
