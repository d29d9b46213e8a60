// Feeds the encoder pipeline and takes its samples.
#include "capture/gst/encoder.h"

#include <gst/app/gstappsink.h>
#include <gst/app/gstappsrc.h>
#include <gst/video/video.h>

#include <algorithm>
#include <cmath>
#include <cstring>

#include "capture/movie/sample_description.h"

namespace lmx {
namespace {

// AAC
constexpr int kSamplesPerPacket = 1024;
constexpr int kEncoderDelay = 1024;  // samples
/// How far the encoder may be behind its feeder.
constexpr std::size_t kFramesInside = 10;
constexpr std::int64_t kSamplesInside = 48000;
/// Long silence is fed in pieces: an hour of it would take a gigabyte.
constexpr std::uint32_t kSoundPiece = 4800;

/// A broken driver must not end the recording: the encoder refuses NaN, and turns samples far beyond full
/// scale into packets that players can't read.
float soundLevel(float sample) { return std::isnan(sample) ? 0.0F : std::clamp(sample, -1.0F, 1.0F); }

Bytes contents(GstBuffer* buffer) {
  Bytes bytes(gst_buffer_get_size(buffer));
  gst_buffer_extract(buffer, 0, bytes.data(), bytes.size());
  return bytes;
}

Bytes codecData(GstSample* sample) {
  const GstStructure* structure = gst_caps_get_structure(gst_sample_get_caps(sample), 0);
  const GValue* value = gst_structure_get_value(structure, "codec_data");
  return value == nullptr ? Bytes() : contents(gst_value_get_buffer(value));
}

/// A buffer of `count` values from `samples` on, or of silence if that is null. Null when out of memory.
BufferHandle soundBuffer(const float* samples, std::size_t count) {
  BufferHandle buffer(gst_buffer_new_allocate(nullptr, count * sizeof(float), nullptr));
  GstMapInfo map;
  if (gst_buffer_map(buffer.get(), &map, GST_MAP_WRITE) == FALSE) return nullptr;
  if (samples != nullptr) {
    std::transform(samples, samples + count, reinterpret_cast<float*>(map.data), soundLevel);
  } else {
    std::memset(map.data, 0, count * sizeof(float));
  }
  gst_buffer_unmap(buffer.get(), &map);
  return buffer;
}

}  // namespace

Encoder::Encoder(const MovieEncoding& movie, const Deadline& patience, EncoderOutput output)
    : video_(movie.video), audio_(movie.audio), patience_(patience), output_(std::move(output)) {
  if (audio_) {
    sound_config_ = audioSpecificConfig(static_cast<std::uint32_t>(audio_->sampleRate),
                                        static_cast<unsigned>(audio_->channels));
  }
}

Result<std::unique_ptr<Encoder>> Encoder::create(const MovieEncoding& movie, const Deadline& patience,
                                                 EncoderOutput output) {
  auto pipeline = newPipeline(encoderDescription(movie));
  if (!pipeline) return std::move(pipeline).error();
  std::unique_ptr<Encoder> encoder(new Encoder(movie, patience, std::move(output)));
  encoder->attach(*std::move(pipeline));
  if (auto problem = encoder->start()) return *std::move(problem);
  return encoder;
}

/// One that can't be started is replaced with another, which tells the same output: this one says nothing
/// then.
std::optional<Error> Encoder::start() {
  const bool refused = gst_element_set_state(pipeline_.get(), GST_STATE_PLAYING) == GST_STATE_CHANGE_FAILURE;
  {
    const std::lock_guard lock(mutex_);
    if (refused || failed_) return Error{problem_.empty() ? "the encoder could not be started" : problem_};
    started_ = true;
  }
  if (audio_) output_.onFormat(soundTrack(), soundFormat(sound_config_));
  return std::nullopt;
}

void Encoder::attach(GstHandle<GstElement> pipeline) {
  pipeline_ = std::move(pipeline);
  if (video_) {
    video_source_ = elementNamed(pipeline_.get(), "vsrc");
    takeFrom("vout", &onVideoSample);
  }
  if (audio_) {
    audio_source_ = elementNamed(pipeline_.get(), "asrc");
    takeFrom("aout", &onAudioSample);
  }
  const GstHandle<GstBus> bus(gst_element_get_bus(pipeline_.get()));
  gst_bus_set_sync_handler(bus.get(), reinterpret_cast<GstBusSyncHandler>(&onMessage), this, nullptr);
}

void Encoder::takeFrom(const char* name, NewSample* onSample) {
  GstAppSinkCallbacks callbacks{};
  callbacks.new_sample = reinterpret_cast<GstFlowReturn (*)(GstAppSink*, gpointer)>(onSample);
  callbacks.eos = reinterpret_cast<void (*)(GstAppSink*, gpointer)>(&onEos);
  const GstHandle<GstElement> sink = elementNamed(pipeline_.get(), name);
  gst_app_sink_set_callbacks(GST_APP_SINK(sink.get()), &callbacks, this, nullptr);
  ++open_streams_;
}

Encoder::~Encoder() {
  gst_element_set_state(pipeline_.get(), GST_STATE_NULL);
  const GstHandle<GstBus> bus(gst_element_get_bus(pipeline_.get()));
  gst_bus_set_sync_handler(bus.get(), nullptr, nullptr, nullptr);
}

void Encoder::pushVideo(GstBuffer* buffer, std::uint32_t place, bool forceKey) {
  if (!waitForRoom([this] { return places_inside_.size() < kFramesInside; })) return;
  {
    const std::lock_guard lock(mutex_);
    places_inside_.push_back(place);
  }
  if (forceKey || keyFrameIsDue(place)) {
    last_key_ = place;
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

/// The encoder counts frames, not time: a slow camera's key frames would be far apart.
bool Encoder::keyFrameIsDue(std::uint32_t place) const {
  return place - last_key_ >= static_cast<std::uint32_t>(keyInterval(video_->frameRate));
}

/// @return false when the frame or sound is to be dropped
template <class HasRoom>
bool Encoder::waitForRoom(HasRoom hasRoom) {
  std::unique_lock lock(mutex_);
  while (!failed_ && !hasRoom() && !patience_.passed()) changed_.wait_for(lock, kDeadlineCheck);
  return !failed_ && hasRoom();
}

void Encoder::pushAudio(const float* samples, std::uint32_t count) {
  while (count > 0) {
    const std::uint32_t piece = std::min(count, kSoundPiece);
    if (!waitForRoom([this] { return audio_pushed_ - audio_out_ < kSamplesInside; })) return;
    pushSound(samples, piece);
    if (samples != nullptr) samples += std::size_t{piece} * static_cast<std::size_t>(audio_->channels);
    count -= piece;
  }
}

void Encoder::pushSound(const float* samples, std::uint32_t count) {
  BufferHandle buffer = soundBuffer(samples, std::size_t{count} * static_cast<std::size_t>(audio_->channels));
  if (!buffer) return;
  const auto time = [this](std::int64_t position) {
    return gst_util_uint64_scale(static_cast<guint64>(position), GST_SECOND,
                                 static_cast<guint64>(audio_->sampleRate));
  };
  GST_BUFFER_PTS(buffer.get()) = time(audio_pushed_);
  audio_pushed_ += count;
  GST_BUFFER_DURATION(buffer.get()) = time(audio_pushed_) - GST_BUFFER_PTS(buffer.get());
  gst_app_src_push_buffer(GST_APP_SRC(audio_source_.get()), buffer.release());
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
    problem_ = problem;
    changed_.notify_all();
    if (!started_) return;
  }
  output_.onError(problem);
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
  const std::uint32_t place = placeOf(sample);
  output_.onFrame({.track = 0,
                   .data = contents(buffer),
                   .sync = GST_BUFFER_FLAG_IS_SET(buffer, GST_BUFFER_FLAG_DELTA_UNIT) == FALSE},
                  place);
  const std::lock_guard lock(mutex_);
  while (!places_inside_.empty() && places_inside_.front() <= place) places_inside_.pop_front();
  changed_.notify_all();
}

/// The encoder shifts time stamps and segment by the same amount.
std::uint32_t Encoder::placeOf(GstSample* sample) const {
  const GstClockTime time = gst_segment_to_running_time(gst_sample_get_segment(sample), GST_FORMAT_TIME,
                                                        GST_BUFFER_PTS(gst_sample_get_buffer(sample)));
  if (!GST_CLOCK_TIME_IS_VALID(time)) return 0;
  return static_cast<std::uint32_t>(
      std::llround(static_cast<double>(time) / 1e9 / video_->frameRate.frameSeconds()));
}

TrackFormat Encoder::soundFormat(const Bytes& config) const {
  TrackFormat format{.timescale = static_cast<std::uint32_t>(audio_->sampleRate),
                     .sampleDescription = {},
                     .priming = kEncoderDelay};
  format.sampleDescription =
      audioSampleDescription(format.timescale, static_cast<std::uint16_t>(audio_->channels), config);
  return format;
}

void Encoder::takeAudio(GstSample* sample) {
  if (audio_packets_ == 0) {
    const Bytes config = codecData(sample);
    if (!config.empty() && config != sound_config_) output_.onFormat(soundTrack(), soundFormat(config));
  }
  // The first packet is all delay. It stays: without it a decoder can't make the first samples of the second.
  const std::int64_t start = audio_packets_++ * kSamplesPerPacket - kEncoderDelay;
  if (start < total_samples_) {
    output_.onSound({.track = soundTrack(),
                     .data = contents(gst_sample_get_buffer(sample)),
                     .duration = kSamplesPerPacket,
                     .sync = true});
  }
  const std::lock_guard lock(mutex_);
  audio_out_ = audio_packets_ * kSamplesPerPacket;
  changed_.notify_all();
}

}  // namespace lmx
