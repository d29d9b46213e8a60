// Builds, watches and closes the pipeline of a device.
#include "capture/source/device_pipeline.h"

#include <gst/app/gstappsink.h>

#include <cstring>

#include "capture/gst/jpeg_guard.h"
#include "capture/gst/stream_colours.h"
#include "capture/source/capture_clock.h"
#include "capture/source/device_elements.h"
#include "capture/source/test_source.h"
#include "support/redacted.h"

namespace lmx {
namespace {

constexpr const char* kWake = "wake";

CaptureErrorCode codeOf(const GError* error) {
  if (error == nullptr || error->domain != GST_RESOURCE_ERROR) return kDeviceFailed;
  switch (error->code) {
    case GST_RESOURCE_ERROR_NOT_FOUND:
      return kDeviceNotFound;
    case GST_RESOURCE_ERROR_BUSY:
      return kDeviceBusy;
    case GST_RESOURCE_ERROR_NOT_AUTHORIZED:
      return kDeviceNotPermitted;
    default:
      return kDeviceFailed;
  }
}

/// Takes ownership of a new element; null stays null.
GstHandle<GstElement> owned(GstElement* element) {
  if (element != nullptr) gst_object_ref_sink(element);
  return GstHandle<GstElement>(element);
}

double seconds(GstClockTime time) { return static_cast<double>(time) / 1e9; }

double durationOf(const GstBuffer* buffer) {
  return GST_BUFFER_DURATION_IS_VALID(buffer) ? seconds(GST_BUFFER_DURATION(buffer)) : 0;
}

double soundSeconds(GstBuffer* buffer) {
  return static_cast<double>(gst_buffer_get_size(buffer)) / (sizeof(float) * kSoundChannels) / kSoundRate;
}

}  // namespace

// ---- opening

Result<std::unique_ptr<DevicePipeline>, CaptureError> DevicePipeline::open(const Wish& wish, FilePacer& pacer,
                                                                           DeviceOutput output) {
  ensureGStreamer();
  CaptureClock::now();  // time begins before the first device
  std::unique_ptr<DevicePipeline> pipeline(new DevicePipeline(wish, pacer, std::move(output)));
  if (auto problem = pipeline->build(wish)) return *std::move(problem);
  const bool waits = !pipeline->real_time_;
  const GstState state = waits ? GST_STATE_PAUSED : GST_STATE_PLAYING;
  if (gst_element_set_state(pipeline->pipeline_.get(), state) == GST_STATE_CHANGE_FAILURE) {
    const MessageHandle message(gst_bus_pop_filtered(pipeline->bus_.get(), GST_MESSAGE_ERROR));
    if (message) return *pipeline->errorFrom(message.get());
    return pipeline->error(kDeviceFailed, "can't be opened");
  }
  return pipeline;
}

DevicePipeline::DevicePipeline(const Wish& wish, FilePacer& pacer, DeviceOutput output)
    : device_(wish.device),
      real_time_(!wish.device.asFastAsPossible()),
      picture_wanted_(wish.picture),
      over_udp_(wish.overUdp),
      pacer_(pacer),
      output_(std::move(output)) {
  pacer_.resume();
}

DevicePipeline::~DevicePipeline() {
  pacer_.interrupt();
  if (pipeline_) gst_element_set_state(pipeline_.get(), GST_STATE_NULL);
}

std::optional<CaptureError> DevicePipeline::build(const Wish& wish) {
  if (device_.kind == DeviceKind::test) {
    auto synthetic =
        newPipeline(syntheticDevice(device_, wish.picture, frameRateFrom(wish.demand.maximumRate)));
    if (!synthetic) return error(kDeviceFailed, synthetic.error().message);
    pipeline_ = *std::move(synthetic);
    wish.picture ? attachTestPicture(pipeline_.get(), device_) : attachTestSound(pipeline_.get(), device_);
    take(pipeline_.get(), wish.picture ? "vsink" : "asink", wish.picture);
  } else {
    pipeline_ = owned(gst_pipeline_new(nullptr));
    guardJpegDecodersIn(pipeline_.get());
  }
  bus_.reset(gst_element_get_bus(pipeline_.get()));
  // One monotonic clock for all: a device's own clock would distort the times of the others.
  const GstHandle<GstClock> clock(gst_system_clock_obtain());
  gst_pipeline_use_clock(GST_PIPELINE(pipeline_.get()), clock.get());
  if (device_.kind == DeviceKind::hardware) return addHardware(wish);
  if (device_.kind == DeviceKind::file || device_.kind == DeviceKind::network) return addUri();
  return std::nullopt;
}

std::optional<CaptureError> DevicePipeline::addUri() {
  // Raw pictures in this container make the demuxer write beside its memory.
  if (device_.kind == DeviceKind::file && device_.name.ends_with(".nut"))
    return error(kDeviceFailed, "NUT files can't be played; convert it to .mkv");
  const auto decoder = uriDecoder(device_);
  if (!decoder) return error(kDeviceFailed, "can't be opened: a GStreamer plug-in is missing");
  g_signal_connect(decoder.get(), "source-setup", G_CALLBACK(&onUriSource), this);
  g_signal_connect(decoder.get(), "pad-added", G_CALLBACK(&onPad), this);
  g_signal_connect(decoder.get(), "no-more-pads", G_CALLBACK(&onNoMorePads), this);
  gst_bin_add(GST_BIN(pipeline_.get()), decoder.get());
  return std::nullopt;
}

std::optional<CaptureError> DevicePipeline::addHardware(const Wish& wish) {
  const auto source = device_.alsaName() ? alsaSource(*device_.alsaName()) : sourceFor(*wish.hardware);
  if (!source) return error(kDeviceFailed, "can't be set up");
  tuneSource(source.get(), false);
  gst_bin_add(GST_BIN(pipeline_.get()), source.get());
  if (wish.picture && wish.hardware) {
    const auto mode = chooseMode(wish.hardware->modes, wish.demand);
    if (mode) mode_ = describe(*mode);
    return addDecoder(source.get(), mode ? capsOf(*mode).get() : nullptr);
  }
  GstElement* branch = addBranch(false);
  if (branch == nullptr || gst_element_link(source.get(), branch) == FALSE)
    return error(kDeviceFailed, "gives no format that can be recorded");
  return std::nullopt;
}

/// Decodes what a camera gives, in the format that was chosen.
std::optional<CaptureError> DevicePipeline::addDecoder(GstElement* source, const GstCaps* caps) {
  const auto filter = owned(gst_element_factory_make("capsfilter", nullptr));
  const auto decoder = owned(gst_element_factory_make("decodebin", nullptr));
  if (!filter || !decoder) return error(kDeviceFailed, "can't be set up: a GStreamer plug-in is missing");
  // A sound and picture server links nobody who takes anything.
  const CapsHandle anyPicture(gst_caps_from_string("video/x-raw; image/jpeg; video/x-h264"));
  g_object_set(filter.get(), "caps", caps != nullptr ? caps : anyPicture.get(), nullptr);
  const GstHandle<GstPad> filtered(gst_element_get_static_pad(filter.get(), "src"));
  correctColours(filtered.get());
  decodeInSoftware(decoder.get());
  g_signal_connect(decoder.get(), "pad-added", G_CALLBACK(&onPad), this);
  for (const auto& element : {&filter, &decoder}) gst_bin_add(GST_BIN(pipeline_.get()), element->get());
  if (gst_element_link_many(source, filter.get(), decoder.get(), nullptr) == FALSE)
    return error(kDeviceFailed, "gives no format that can be recorded");
  return std::nullopt;
}

// ---- streams that show up

void DevicePipeline::onUriSource(GstElement* /*decoder*/, GstElement* source, gpointer self) noexcept {
  tuneSource(source, static_cast<DevicePipeline*>(self)->over_udp_);
}

void DevicePipeline::onPad(GstElement* /*decoder*/, GstPad* pad, gpointer self) noexcept {
  static_cast<DevicePipeline*>(self)->linkPad(pad);
}

void DevicePipeline::onNoMorePads(GstElement* decoder, gpointer self) noexcept {
  auto& pipeline = *static_cast<DevicePipeline*>(self);
  pipeline.may_have_sound_ = pipeline.has_sound_.load();
  pipeline.wake();
  if (pipeline.picture_wanted_ ? pipeline.has_picture_ : pipeline.has_sound_) return;
  GST_ELEMENT_ERROR(decoder, STREAM, WRONG_TYPE,
                    ("it has no %s that can be decoded", pipeline.picture_wanted_ ? "picture" : "sound"),
                    (nullptr));
}

/// The first picture and the first sound are taken.
void DevicePipeline::linkPad(GstPad* pad) {
  CapsHandle caps(gst_pad_get_current_caps(pad));
  if (!caps) caps.reset(gst_pad_query_caps(pad, nullptr));
  if (!caps || gst_caps_is_empty(caps.get()) || gst_caps_is_any(caps.get())) return;
  const char* name = gst_structure_get_name(gst_caps_get_structure(caps.get(), 0));
  const bool picture = std::strncmp(name, "video/", 6) == 0;
  if (!picture && std::strncmp(name, "audio/", 6) != 0) return;
  if ((picture ? has_picture_ : has_sound_).exchange(true)) return;
  GstElement* branch = addBranch(picture);
  const GstHandle<GstPad> sink(branch == nullptr ? nullptr : gst_element_get_static_pad(branch, "sink"));
  if (branch != nullptr) gst_element_sync_state_with_parent(branch);
  if (sink && gst_pad_link(pad, sink.get()) == GST_PAD_LINK_OK) return;
  GST_ELEMENT_ERROR(pipeline_.get(), STREAM, FORMAT,
                    ("it gives a %s that can't be taken: %s", picture ? "picture" : "sound",
                     GText(gst_caps_to_string(caps.get())).get()),
                    (nullptr));
}

/// @return the branch, which the pipeline owns; null when it can't be made
GstElement* DevicePipeline::addBranch(bool picture) {
  const auto branch = branchFor(picture);
  if (!branch) return nullptr;
  take(branch.get(), picture ? "vsink" : "asink", picture);
  gst_bin_add(GST_BIN(pipeline_.get()), branch.get());
  return branch.get();
}

void DevicePipeline::take(GstElement* branch, const char* name, bool picture) {
  const auto sink = elementNamed(branch, name);
  GstAppSinkCallbacks callbacks{};
  callbacks.new_sample =
      reinterpret_cast<GstFlowReturn (*)(GstAppSink*, gpointer)>(picture ? &onPictureSample : &onSoundSample);
  gst_app_sink_set_callbacks(GST_APP_SINK(sink.get()), &callbacks, this, nullptr);
}

// ---- flow

void DevicePipeline::start() { gst_element_set_state(pipeline_.get(), GST_STATE_PLAYING); }

GstFlowReturn DevicePipeline::onPictureSample(GstElement* sink, gpointer self) noexcept {
  const SampleHandle sample(gst_app_sink_pull_sample(GST_APP_SINK(sink)));
  if (sample) static_cast<DevicePipeline*>(self)->deliver(sample.get(), true);
  return GST_FLOW_OK;
}

GstFlowReturn DevicePipeline::onSoundSample(GstElement* sink, gpointer self) noexcept {
  const SampleHandle sample(gst_app_sink_pull_sample(GST_APP_SINK(sink)));
  if (sample) static_cast<DevicePipeline*>(self)->deliver(sample.get(), false);
  return GST_FLOW_OK;
}

void DevicePipeline::deliver(GstSample* sample, bool picture) {
  const double arrival = CaptureClock::now();
  GstBuffer* buffer = gst_sample_get_buffer(sample);
  if (buffer == nullptr) return;
  const double length = picture ? durationOf(buffer) : soundSeconds(buffer);
  auto time = timeOf(sample, length);
  if (!time) return;
  if (device_.kind == DeviceKind::network) {
    const auto stream = picture ? StreamClock::Stream::picture : StreamClock::Stream::sound;
    time = stream_clock_.place(stream, *time, arrival);
  }
  if (picture) {
    output_.onPicture(sample, *time);
  } else {
    output_.onSound(buffer, *time, device_.kind == DeviceKind::hardware ? arrival : *time + length);
  }
}

/// Running time of a sample that lasts `length` seconds; of a file's once it is due. Nothing for one without
/// a time, and when the pipeline is being closed.
std::optional<double> DevicePipeline::timeOf(GstSample* sample, double length) {
  const GstClockTime stamp = GST_BUFFER_PTS(gst_sample_get_buffer(sample));
  const GstClockTime time =
      gst_segment_to_running_time(gst_sample_get_segment(sample), GST_FORMAT_TIME, stamp);
  if (!GST_CLOCK_TIME_IS_VALID(time)) {
    // A driver that stamps nothing: what has just come is of now.
    if (device_.kind == DeviceKind::hardware && !GST_CLOCK_TIME_IS_VALID(stamp))
      return CaptureClock::now() - length;
    return std::nullopt;
  }
  if (device_.kind == DeviceKind::file) return pacer_.wait(seconds(time), length);
  if (!real_time_) return seconds(time);
  return CaptureClock::at(gst_element_get_base_time(pipeline_.get())) + seconds(time);
}

// ---- messages and errors

std::optional<CaptureError> DevicePipeline::watch(std::chrono::milliseconds limit) {
  constexpr auto kTypes =
      static_cast<GstMessageType>(GST_MESSAGE_ERROR | GST_MESSAGE_EOS | GST_MESSAGE_APPLICATION);
  const auto time = static_cast<GstClockTime>(std::chrono::nanoseconds(limit).count());
  const MessageHandle message(gst_bus_timed_pop_filtered(bus_.get(), time, kTypes));
  if (!message) return std::nullopt;
  switch (GST_MESSAGE_TYPE(message.get())) {
    case GST_MESSAGE_ERROR:
      return errorFrom(message.get());
    case GST_MESSAGE_EOS:
      return error(kStreamEnded, "the stream has ended");
    default:
      return std::nullopt;
  }
}

void DevicePipeline::wake() {
  gst_bus_post(bus_.get(), gst_message_new_application(nullptr, gst_structure_new_empty(kWake)));
}

CaptureError DevicePipeline::error(CaptureErrorCode code, const std::string& problem) const {
  return {CaptureError::kDomain, code, redacted(device_.text + ": " + problem)};
}

std::optional<CaptureError> DevicePipeline::errorFrom(GstMessage* message) const {
  GError* raw = nullptr;
  gst_message_parse_error(message, &raw, nullptr);
  const ErrorHandle problem(raw);
  return error(codeOf(problem.get()), problem ? problem->message : "failed");
}

}  // namespace lmx
