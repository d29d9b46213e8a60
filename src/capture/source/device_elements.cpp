// Makes and sets up elements.
#include "capture/source/device_elements.h"

#include "capture/gst/rtp_guard.h"
#include "capture/gst/stream_colours.h"
#include "capture/source/device_pipeline.h"
#include "capture/source/pipewire_connection.h"
#include "platform/log.h"
#include "support/format.h"

namespace lmx {
namespace {

constexpr const char* kSink = "sync=false async=false enable-last-sample=false qos=false max-buffers=4 ";
constexpr unsigned kNetworkLatencyMs = 300;           // packets that come later than that are lost
constexpr std::uint64_t kNetworkTimeoutUs = 5000000;  // of a connection
constexpr std::int64_t kSoundBufferUs = 1000000;      // what a busy machine reads later is not lost

std::string rateText(FrameRate rate) { return string_with_format("%d/%d", rate.numerator, rate.denominator); }

std::string soundCaps() {
  return string_with_format("audio/x-raw,format=F32LE,layout=interleaved,rate=%d,channels=%d", kSoundRate,
                            kSoundChannels);
}

bool has(GstElement* element, const char* property) {
  return g_object_class_find_property(G_OBJECT_GET_CLASS(element), property) != nullptr;
}

}  // namespace

GstHandle<GstElement> branchFor(bool picture) {
  // The queue lets the next picture be decoded while this one is being taken. Of an interlaced picture one
  // field is taken: as many pictures a second as the device has frames.
  const std::string description =
      picture ? std::string(
                    "queue max-size-buffers=4 max-size-bytes=0 max-size-time=0 ! "
                    "deinterlace mode=auto fields=top ! appsink name=vsink caps=video/x-raw ") +
                    kSink
              : "audioconvert ! audioresample ! " + soundCaps() + " ! appsink name=asink " + kSink;
  GError* raw = nullptr;
  GstElement* bin = gst_parse_bin_from_description(description.c_str(), TRUE, &raw);
  const ErrorHandle error(raw);
  if (bin == nullptr) {
    LMPLogMessage(nullptr, kLogError, "Part of the capture can't be set up: %s",
                  error ? error->message : "no reason given");
    return nullptr;
  }
  gst_object_ref_sink(bin);
  return GstHandle<GstElement>(bin);
}

std::string syntheticDevice(const DeviceID& device, bool picture, FrameRate rate) {
  const char* live = device.asFastAsPossible() ? "false" : "true";
  if (!picture) {
    return string_with_format("audiotestsrc name=asource is-live=%s wave=silence samplesperbuffer=%d ! %s ! ",
                              live, kSoundRate / 100, soundCaps().c_str()) +
           "appsink name=asink " + kSink;
  }
  const PictureSize size = pictureSize(device);
  return string_with_format(
             "videotestsrc name=vsource is-live=%s pattern=smpte horizontal-speed=4 ! "
             "video/x-raw,format=I420,width=%d,height=%d,framerate=%s,pixel-aspect-ratio=1/"
             "1,colorimetry=bt709 ! ",
             live, size.width, size.height, rateText(syntheticRate(device).value_or(rate)).c_str()) +
         "appsink name=vsink " + kSink;
}

GstHandle<GstElement> uriDecoder(const DeviceID& device) {
  GstElement* decoder = gst_element_factory_make("uridecodebin", nullptr);
  if (decoder == nullptr) return nullptr;
  gst_object_ref_sink(decoder);
  g_object_set(decoder, "uri", device.text.c_str(), nullptr);
  decodeInSoftware(decoder);
  correctColoursIn(decoder);
  guardDepayloadersIn(decoder);
  return GstHandle<GstElement>(decoder);
}

void decodeInSoftware(GstElement* decoder) {
  if (has(decoder, "force-sw-decoders")) g_object_set(decoder, "force-sw-decoders", TRUE, nullptr);
}

GstHandle<GstElement> alsaSource(const std::string& pcm) {
  GstElement* source = gst_element_factory_make("alsasrc", nullptr);
  if (source == nullptr) return nullptr;
  gst_object_ref_sink(source);
  g_object_set(source, "device", pcm.c_str(), nullptr);
  return GstHandle<GstElement>(source);
}

void tuneSource(GstElement* source, bool overUdp) {
  connectApart(source);
  if (has(source, "provide-clock")) g_object_set(source, "provide-clock", FALSE, nullptr);
  if (has(source, "slave-method")) gst_util_set_object_arg(G_OBJECT(source), "slave-method", "none");
  if (has(source, "buffer-time")) g_object_set(source, "buffer-time", kSoundBufferUs, nullptr);
  if (has(source, "always-copy")) g_object_set(source, "always-copy", TRUE, nullptr);
  if (has(source, "protocols") && has(source, "latency")) {  // RTSP
    g_object_set(source, "latency", kNetworkLatencyMs, "tcp-timeout", kNetworkTimeoutUs, "timeout",
                 kNetworkTimeoutUs, nullptr);
    gst_util_set_object_arg(G_OBJECT(source), "protocols", overUdp ? "udp" : "tcp");
    // The camera's stamps and nothing else: a stall must not move what comes after it. StreamClock does the
    // rest.
    gst_util_set_object_arg(G_OBJECT(source), "buffer-mode", "synced");
  }
}

}  // namespace lmx
