// The encoder pipeline.
#include "capture/gst/encoder.h"

#include <gst/app/gstappsink.h>
#include <gst/app/gstappsrc.h>
#include <gst/video/video.h>

#include <algorithm>
#include <cmath>
#include <cstring>

#include "capture/movie/movie_boxes.h"
#include "platform/log.h"
#include "support/format.h"

namespace lmx {
namespace {

constexpr int kSamplesPerPacket = 1024;  // AAC

std::string videoDescription(const VideoEncoding& video) {
  const FrameRate rate = video.frameRate;
  const int keyInterval = std::max(1, static_cast<int>(std::lround(1.0 / rate.frameSeconds())));
  return string_with_format(
      "appsrc name=vsrc format=time block=true max-buffers=8 max-bytes=0 max-time=0 stream-type=stream "
      "caps=video/x-raw,format=I420,width=%d,height=%d,framerate=%d/%d,pixel-aspect-ratio=1/1 ! "
      "x264enc tune=zerolatency speed-preset=%s bitrate=%d key-int-max=%d byte-stream=false aud=false "
      "option-string=scenecut=0 ! video/x-h264,stream-format=avc,alignment=au ! "
      "appsink name=vout sync=false async=false max-buffers=0 enable-last-sample=false ",
      video.size.width, video.size.height, rate.numerator, rate.denominator, speedPreset(video),
      videoBitRate(video), keyInterval);
}

std::string audioDescription(const AudioEncoding& audio) {
  return string_with_format(
      "appsrc name=asrc format=time block=true max-buffers=64 max-bytes=0 max-time=0 stream-type=stream "
      "caps=audio/x-raw,format=F32LE,layout=interleaved,rate=%d,channels=%d%s ! "
      "avenc_aac bitrate=%d ! appsink name=aout sync=false async=false max-buffers=0 "
      "enable-last-sample=false ",
      audio.sampleRate, audio.channels, audio.channels == 2 ? ",channel-mask=(bitmask)0x3" : "",
      audio.bitRate);
}

/// What a broken driver gives must not end the recording: the encoder refuses what is no number, and of a
/// sample far beyond full scale it makes a packet that players can't read.
float soundLevel(float sample) { return std::isnan(sample) ? 0.0F : std::clamp(sample, -1.0F, 1.0F); }

Bytes codecData(GstSample* sample) {
  const GstStructure* structure = gst_caps_get_structure(gst_sample_get_caps(sample), 0);
  const GValue* value = gst_structure_get_value(structure, "codec_data");
  if (value == nullptr) return {};
  GstBuffer* buffer = gst_value_get_buffer(value);
  Bytes bytes(gst_buffer_get_size(buffer));
  gst_buffer_extract(buffer, 0, bytes.data(), bytes.size());
  return bytes;
}

Bytes contents(GstBuffer* buffer) {
  Bytes bytes(gst_buffer_get_size(buffer));
  gst_buffer_extract(buffer, 0, bytes.data(), bytes.size());
  return bytes;
}

}  // namespace

int videoBitRate(const VideoEncoding& video) {
  static constexpr double kFactor[] = {0.75, 1.0, 1.6};
  const double megapixels = video.size.width * video.size.height / video.frameRate.frameSeconds() / 1e6;
  // About 2.5 Mbit/s at 720p30 and 4.5 at 1080p30: slides and a speaker, sharp text.
  const double kilobits = 205.0 * std::pow(megapixels, 0.75);
  return std::max(150, static_cast<int>(kilobits * kFactor[static_cast<int>(video.quality)]));
}

const char* speedPreset(const VideoEncoding& video) {
  const bool upTo720p = video.size.width * video.size.height <= 1280 * 720;
  if (video.quality == RecordingQuality::good || !upTo720p) return "superfast";
  return "veryfast";
}

std::uint32_t videoTimescale(FrameRate rate) {
  std::uint32_t scale = static_cast<std::uint32_t>(rate.numerator);
  while (scale < 10000) scale *= 10;
  return scale;
}

std::uint32_t frameDuration(FrameRate rate) {
  return videoTimescale(rate) / static_cast<std::uint32_t>(rate.numerator) *
         static_cast<std::uint32_t>(rate.denominator);
}

Encoder::Encoder(std::optional<VideoEncoding> video, std::optional<AudioEncoding> audio, EncoderOutput output)
    : video_(video), audio_(audio), output_(std::move(output)) {}

std::unique_ptr<Encoder> Encoder::create(const std::optional<VideoEncoding>& video,
                                         const std::optional<AudioEncoding>& audio, EncoderOutput output,
                                         std::string* problem) {
  std::unique_ptr<Encoder> encoder(new Encoder(video, audio, std::move(output)));
  return encoder->build(problem) ? std::move(encoder) : nullptr;
}

bool Encoder::build(std::string* problem) {
  std::string description;
  if (video_) description += videoDescription(*video_);
  if (audio_) description += audioDescription(*audio_);
  pipeline_ = newPipeline(description, problem);
  if (!pipeline_) return false;
  const auto attach = [this](const char* name, GstFlowReturn (*onSample)(GstElement*, gpointer) noexcept) {
    GstAppSinkCallbacks callbacks{};
    callbacks.new_sample = reinterpret_cast<GstFlowReturn (*)(GstAppSink*, gpointer)>(onSample);
    callbacks.eos = reinterpret_cast<void (*)(GstAppSink*, gpointer)>(&onEos);
    const GstHandle<GstElement> sink = elementNamed(pipeline_.get(), name);
    gst_app_sink_set_callbacks(GST_APP_SINK(sink.get()), &callbacks, this, nullptr);
    ++open_streams_;
  };
  if (video_) {
    video_source_ = elementNamed(pipeline_.get(), "vsrc");
    attach("vout", &onVideoSample);
  }
  if (audio_) {
    audio_source_ = elementNamed(pipeline_.get(), "asrc");
    attach("aout", &onAudioSample);
  }
  const GstHandle<GstBus> bus(gst_element_get_bus(pipeline_.get()));
  gst_bus_set_sync_handler(bus.get(), reinterpret_cast<GstBusSyncHandler>(&onMessage), this, nullptr);
  if (gst_element_set_state(pipeline_.get(), GST_STATE_PLAYING) == GST_STATE_CHANGE_FAILURE) {
    *problem = "the encoder could not be started";
    return false;
  }
  return true;
}

Encoder::~Encoder() {
  if (!pipeline_) return;
  gst_element_set_state(pipeline_.get(), GST_STATE_NULL);
  const GstHandle<GstBus> bus(gst_element_get_bus(pipeline_.get()));
  gst_bus_set_sync_handler(bus.get(), nullptr, nullptr, nullptr);
}

void Encoder::pushVideo(GstBuffer* buffer, std::uint32_t place, bool forceKey) {
  if (failed()) return;
  if (forceKey) {
    // Sent into the stream behind the frames already queued: appsrc serialises events with its buffers.
    gst_element_send_event(video_source_.get(),
                           gst_video_event_new_downstream_force_key_unit(
                               GST_CLOCK_TIME_NONE, GST_CLOCK_TIME_NONE, GST_CLOCK_TIME_NONE, TRUE, 0));
  }
  GstBuffer* frame = gst_buffer_copy(buffer);  // shares the pixels
  const double seconds = video_->frameRate.frameSeconds();
  GST_BUFFER_PTS(frame) = static_cast<GstClockTime>(std::llround(place * seconds * 1e9));
  GST_BUFFER_DTS(frame) = GST_CLOCK_TIME_NONE;
  GST_BUFFER_DURATION(frame) = static_cast<GstClockTime>(std::llround(seconds * 1e9));
  gst_app_src_push_buffer(GST_APP_SRC(video_source_.get()), frame);
}

void Encoder::pushAudio(const float* samples, std::uint32_t count) {
  if (failed()) return;
  const std::size_t bytes = std::size_t{count} * static_cast<std::size_t>(audio_->channels) * sizeof(float);
  GstBuffer* buffer = gst_buffer_new_allocate(nullptr, bytes, nullptr);
  GstMapInfo map;
  if (gst_buffer_map(buffer, &map, GST_MAP_WRITE) == FALSE) {
    gst_buffer_unref(buffer);
    return;
  }
  if (samples != nullptr) {
    std::transform(samples, samples + bytes / sizeof(float), reinterpret_cast<float*>(map.data), soundLevel);
  } else {
    std::memset(map.data, 0, bytes);
  }
  gst_buffer_unmap(buffer, &map);
  const auto time = [this](std::int64_t position) {
    return gst_util_uint64_scale(static_cast<guint64>(position), GST_SECOND,
                                 static_cast<guint64>(audio_->sampleRate));
  };
  GST_BUFFER_PTS(buffer) = time(audio_pushed_);
  audio_pushed_ += count;
  GST_BUFFER_DURATION(buffer) = time(audio_pushed_) - GST_BUFFER_PTS(buffer);
  gst_app_src_push_buffer(GST_APP_SRC(audio_source_.get()), buffer);
}

bool Encoder::finish(std::int64_t totalSamples, std::chrono::milliseconds limit) {
  total_samples_ = totalSamples;
  if (video_source_) gst_app_src_end_of_stream(GST_APP_SRC(video_source_.get()));
  if (audio_source_) gst_app_src_end_of_stream(GST_APP_SRC(audio_source_.get()));
  std::unique_lock lock(mutex_);
  return changed_.wait_for(lock, limit, [this] { return open_streams_ == 0 || failed_; }) && !failed_;
}

GstFlowReturn Encoder::onVideoSample(GstElement* sink, gpointer self) noexcept {
  const SampleHandle sample(gst_app_sink_pull_sample(GST_APP_SINK(sink)));
  if (sample) static_cast<Encoder*>(self)->takeVideo(sample.get());
  return GST_FLOW_OK;
}

GstFlowReturn Encoder::onAudioSample(GstElement* sink, gpointer self) noexcept {
  const SampleHandle sample(gst_app_sink_pull_sample(GST_APP_SINK(sink)));
  if (sample) static_cast<Encoder*>(self)->takeAudio(sample.get());
  return GST_FLOW_OK;
}

void Encoder::onEos(GstElement* /*sink*/, gpointer self) noexcept {
  auto& encoder = *static_cast<Encoder*>(self);
  const std::lock_guard lock(encoder.mutex_);
  --encoder.open_streams_;
  encoder.changed_.notify_all();
}

GstBusSyncReply Encoder::onMessage(GstBus* /*bus*/, GstMessage* message, gpointer self) noexcept {
  if (GST_MESSAGE_TYPE(message) == GST_MESSAGE_ERROR) {
    GError* raw = nullptr;
    gst_message_parse_error(message, &raw, nullptr);
    const ErrorHandle error(raw);
    static_cast<Encoder*>(self)->fail(error ? error->message : "the encoder failed");
  }
  gst_message_unref(message);
  return GST_BUS_DROP;
}

void Encoder::fail(const std::string& problem) {
  {
    const std::lock_guard lock(mutex_);
    if (std::exchange(failed_, true)) return;
    changed_.notify_all();
  }
  // Nothing empties their queues any more: a feeder that waits for room would wait for ever.
  for (const auto& source : {&video_source_, &audio_source_}) {
    if (*source) gst_app_src_set_max_buffers(GST_APP_SRC(source->get()), 0);
  }
  output_.onError(problem);
}

bool Encoder::failed() {
  const std::lock_guard lock(mutex_);
  return failed_;
}

void Encoder::takeVideo(GstSample* sample) {
  if (!video_format_known_) {
    video_format_known_ = true;
    TrackFormat format{.isVideo = true,
                       .timescale = videoTimescale(video_->frameRate),
                       .width = static_cast<std::uint16_t>(video_->size.width),
                       .height = static_cast<std::uint16_t>(video_->size.height),
                       .sampleDescription = {}};
    format.sampleDescription = videoSampleDescription(format.width, format.height, codecData(sample));
    output_.onFormat(0, std::move(format));
  }
  GstBuffer* buffer = gst_sample_get_buffer(sample);
  // Every frame that goes in comes out, in order: its place needs no time stamp.
  output_.onSample({.track = 0,
                    .data = contents(buffer),
                    .duration = frameDuration(video_->frameRate),
                    .sync = GST_BUFFER_FLAG_IS_SET(buffer, GST_BUFFER_FLAG_DELTA_UNIT) == FALSE});
}

void Encoder::takeAudio(GstSample* sample) {
  const std::uint32_t track = video_ ? 1 : 0;
  if (!audio_format_known_) {
    audio_format_known_ = true;
    TrackFormat format{.timescale = static_cast<std::uint32_t>(audio_->sampleRate), .sampleDescription = {}};
    format.sampleDescription = audioSampleDescription(
        format.timescale, static_cast<std::uint16_t>(audio_->channels), codecData(sample));
    output_.onFormat(track, std::move(format));
  }
  // The first packet holds nothing but the encoder's 1,024 samples of delay; without it the sound stands
  // where it belongs, with no edit list that a player might ignore.
  const std::int64_t start = (audio_packets_++ - 1) * kSamplesPerPacket;
  if (start < 0 || start >= total_samples_) return;
  output_.onSample({.track = track,
                    .data = contents(gst_sample_get_buffer(sample)),
                    .duration = kSamplesPerPacket,
                    .sync = true});
}

}  // namespace lmx
