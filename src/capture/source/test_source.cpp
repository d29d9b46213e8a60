// Pad probes that draw, tick and simulate faults.
#include "capture/source/test_source.h"

#include <gst/video/video.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <numbers>
#include <optional>

#include "capture/gst/gst_handles.h"
#include "capture/source/capture_clock.h"
#include "capture/source/device_pipeline.h"
#include "capture/source/test_picture.h"

namespace lmx {
namespace {

constexpr double kTickHertz = 1000;
constexpr double kTickLevel = 0.8;

struct Probe {
  DeviceID id;
  bool video = false;
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

void draw(GstBuffer* buffer, const Probe& probe, std::uint64_t count, double frameSeconds) {
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
  const auto number = static_cast<std::uint32_t>(count);
  drawFrameNumber(plane, number);
  drawClock(plane, clockText(static_cast<double>(count) * frameSeconds));
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

/// Running time of the buffer, seconds: all live synthetic devices draw and tick by the same clock.
double runningTimeOf(GstPad* pad, GstBuffer* buffer, const Probe& probe) {
  const double sinceOpening = static_cast<double>(GST_BUFFER_PTS(buffer)) / 1e9;
  if (probe.id.asFastAsPossible()) return sinceOpening;
  const GstHandle<GstElement> source(gst_pad_get_parent_element(pad));
  return CaptureClock::at(gst_element_get_base_time(source.get())) + sinceOpening;
}

/// The number of the grain, of those that last 1/`rate` each, that has begun last at `time`. A live buffer's
/// time is moved back to its beginning; nothing comes from the future. @return nothing for a buffer that
/// would be older than the device
std::optional<std::uint64_t> alignToGrain(GstBuffer* buffer, double time, FrameRate rate, bool live) {
  const double number = std::floor(time / rate.frameSeconds() + 1e-3);
  const double earlier = std::max(0.0, (time - number * rate.frameSeconds()) * 1e9);
  if (live) {
    if (earlier > static_cast<double>(GST_BUFFER_PTS(buffer))) return std::nullopt;
    GST_BUFFER_PTS(buffer) -= static_cast<GstClockTime>(earlier);
  }
  return static_cast<std::uint64_t>(number);
}

/// A tick fills the last hundredth of each second and begins with a zero.
void fillSound(GstBuffer* buffer, std::uint64_t first) {
  GstMapInfo map;
  if (gst_buffer_map(buffer, &map, GST_MAP_WRITE) == FALSE) return;
  auto* samples = reinterpret_cast<float*>(map.data);
  constexpr std::uint64_t kTickStart = kSoundRate - kSoundRate / 100;
  const std::size_t count = map.size / sizeof(float) / kSoundChannels;
  for (std::size_t i = 0; i < count; ++i) {
    const std::uint64_t inSecond = (first + i) % kSoundRate;
    const double phase = static_cast<double>(inSecond) * kTickHertz / kSoundRate * 2 * std::numbers::pi;
    const double level = inSecond > kTickStart ? kTickLevel * std::sin(phase) : 0;
    for (int channel = 0; channel < kSoundChannels; ++channel) *samples++ = static_cast<float>(level);
  }
  gst_buffer_unmap(buffer, &map);
}

GstPadProbeReturn onBuffer(GstPad* pad, GstPadProbeInfo* info, gpointer user) noexcept {
  const auto& probe = *static_cast<Probe*>(user);
  GstBuffer* buffer = GST_PAD_PROBE_INFO_BUFFER(info);
  const double sinceOpening = static_cast<double>(GST_BUFFER_PTS(buffer)) / 1e9;
  const GstPadProbeReturn fault = playFault(pad, probe, sinceOpening);
  if (fault != GST_PAD_PROBE_OK) return fault;
  buffer = gst_buffer_make_writable(buffer);
  GST_PAD_PROBE_INFO_DATA(info) = buffer;
  const double time = runningTimeOf(pad, buffer, probe);
  const FrameRate rate = probe.video ? frameRateFrom(1e9 / static_cast<double>(GST_BUFFER_DURATION(buffer)))
                                     : FrameRate{kSoundRate, 1};
  const auto number = alignToGrain(buffer, time, rate, !probe.id.asFastAsPossible());
  if (!number) return GST_PAD_PROBE_DROP;
  probe.video ? draw(buffer, probe, *number, rate.frameSeconds()) : fillSound(buffer, *number);
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
