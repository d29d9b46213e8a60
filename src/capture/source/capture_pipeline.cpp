// Starting, running and closing the capture devices.
#include "capture/source/capture_pipeline.h"

#include <gst/app/gstappsink.h>
#include <gst/video/video.h>

#include <chrono>

#include "capture/source/pipeline_builder.h"
#include "support/time_value.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

using Medium = CaptureConsumers::Medium;

constexpr auto kOpeningLimit = 5s;  // until a device has given its first picture

void takeFrom(GstElement* sink, GstFlowReturn (*newSample)(GstElement*, gpointer) noexcept, gpointer self) {
  if (sink == nullptr) return;
  GstAppSinkCallbacks callbacks{};
  callbacks.new_sample = reinterpret_cast<GstFlowReturn (*)(GstAppSink*, gpointer)>(newSample);
  gst_app_sink_set_callbacks(GST_APP_SINK(sink), &callbacks, self, nullptr);
}

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

}  // namespace

// ---- opening and closing

Result<std::shared_ptr<CapturePipeline>, CaptureError> CapturePipeline::open(const CaptureSource& source) {
  auto built = buildCapturePipeline(source);
  if (!built) return std::move(built).error();
  std::shared_ptr<CapturePipeline> pipeline(new CapturePipeline(source));
  pipeline->attach(*std::move(built));
  if (auto error = pipeline->settle()) return *std::move(error);
  pipeline->begin();
  return pipeline;
}

CapturePipeline::CapturePipeline(const CaptureSource& source)
    : source_(source),
      video_(source.video()),
      audio_(source.audio()),
      real_time_(!video_.asFastAsPossible() && !audio_.asFastAsPossible()) {
  if (video_.kind != DeviceKind::test) return;
  const PictureSize size = pictureSize(video_);
  width_ = size.width;
  height_ = size.height;
}

CapturePipeline::~CapturePipeline() {
  ending_ = true;
  gst_bus_post(bus_.get(), gst_message_new_application(nullptr, gst_structure_new_empty("end")));
  if (bus_thread_.joinable()) bus_thread_.join();
  gst_element_set_state(pipeline_.get(), GST_STATE_NULL);
}

void CapturePipeline::attach(GstHandle<GstElement> pipeline) {
  pipeline_ = std::move(pipeline);
  bus_.reset(gst_element_get_bus(pipeline_.get()));
  video_sink_ = elementNamed(pipeline_.get(), "vsink");
  audio_sink_ = elementNamed(pipeline_.get(), "asink");
  takeFrom(video_sink_.get(), &newVideoSample, this);
  takeFrom(audio_sink_.get(), &newAudioSample, this);
}

/// Waits until the devices are ready. @return why they are not
std::optional<CaptureError> CapturePipeline::settle() {
  GstStateChangeReturn result = gst_element_set_state(pipeline_.get(), GST_STATE_PAUSED);
  const auto deadline = std::chrono::steady_clock::now() + kOpeningLimit;  // opening itself may take its time
  while (result == GST_STATE_CHANGE_ASYNC && std::chrono::steady_clock::now() < deadline) {
    result = gst_element_get_state(pipeline_.get(), nullptr, nullptr, 20 * GST_MSECOND);
    if (auto error = pendingError()) return error;
  }
  if (result != GST_STATE_CHANGE_FAILURE && result != GST_STATE_CHANGE_ASYNC) return std::nullopt;
  if (auto error = pendingError()) return error;
  return CaptureError{CaptureError::kDomain, kDeviceSilent,
                      "\"" + source_.name() + "\" gave no picture within 5 s"};
}

void CapturePipeline::begin() {
  silence_.restart();
  opened_at_ = secondsSinceReferenceDate();
  if (video_.kind == DeviceKind::file || audio_.kind == DeviceKind::file) loopFile(true);
  if (real_time_) start();
  bus_thread_ = std::thread([this] { watchBus(); });
}

void CapturePipeline::start() {
  if (running_.exchange(true)) return;
  silence_.restart();
  gst_element_set_state(pipeline_.get(), GST_STATE_PLAYING);
  // A file prerolls again after its seek: until then there is no base time, and running time means nothing.
  gst_element_get_state(pipeline_.get(), nullptr, nullptr, 2 * GST_SECOND);
}

// ---- time

double CapturePipeline::runningTime() const {
  const GstHandle<GstClock> clock(gst_system_clock_obtain());
  const GstClockTime now = gst_clock_get_time(clock.get());
  const GstClockTime base = gst_element_get_base_time(pipeline_.get());
  return (static_cast<double>(now) - static_cast<double>(base)) / 1e9;
}

double CapturePipeline::wallOffset() const {
  return real_time_ ? secondsSinceReferenceDate() - runningTime() : opened_at_;
}

double CapturePipeline::runningTimeAt(double wallTime) const { return wallTime - wallOffset(); }

// ---- flow

GstFlowReturn CapturePipeline::newVideoSample(GstElement* sink, gpointer self) noexcept {
  const SampleHandle sample(gst_app_sink_pull_sample(GST_APP_SINK(sink)));
  if (sample) static_cast<CapturePipeline*>(self)->deliver(Medium::video, sample.get());
  return GST_FLOW_OK;
}

GstFlowReturn CapturePipeline::newAudioSample(GstElement* sink, gpointer self) noexcept {
  const SampleHandle sample(gst_app_sink_pull_sample(GST_APP_SINK(sink)));
  if (sample) static_cast<CapturePipeline*>(self)->deliver(Medium::audio, sample.get());
  return GST_FLOW_OK;
}

void CapturePipeline::deliver(Medium medium, GstSample* sample) {
  medium == Medium::video ? silence_.heardVideo() : silence_.heardAudio();
  GstBuffer* buffer = gst_sample_get_buffer(sample);
  if (buffer == nullptr) return;
  const GstClockTime time =
      gst_segment_to_running_time(gst_sample_get_segment(sample), GST_FORMAT_TIME, GST_BUFFER_PTS(buffer));
  if (!GST_CLOCK_TIME_IS_VALID(time)) return;
  if (medium == Medium::video && width_ == 0) noteSize(sample);
  consumers_.deliver(medium, buffer, static_cast<double>(time) / 1e9);
}

void CapturePipeline::noteSize(GstSample* sample) {
  GstVideoInfo info;
  if (gst_video_info_from_caps(&info, gst_sample_get_caps(sample)) == FALSE) return;
  width_ = info.width;
  height_ = info.height;
}

// ---- messages and errors

std::optional<CaptureError> CapturePipeline::pendingError() const {
  const MessageHandle message(gst_bus_pop_filtered(bus_.get(), GST_MESSAGE_ERROR));
  return message ? std::optional(errorFrom(message.get())) : std::nullopt;
}

CaptureError CapturePipeline::errorFrom(GstMessage* message) const {
  GError* raw = nullptr;
  gst_message_parse_error(message, &raw, nullptr);
  const ErrorHandle error(raw);
  return {CaptureError::kDomain, codeOf(error.get()),
          source_.name() + ": " + (error ? error->message : "failed")};
}

void CapturePipeline::watchBus() {
  constexpr auto kTypes = static_cast<GstMessageType>(GST_MESSAGE_ERROR | GST_MESSAGE_EOS |
                                                      GST_MESSAGE_SEGMENT_DONE | GST_MESSAGE_APPLICATION);
  while (!ending_) {
    const MessageHandle message(gst_bus_timed_pop_filtered(bus_.get(), 500 * GST_MSECOND, kTypes));
    if (ending_) return;
    if (message) handleMessage(message.get());
    if (running_ && real_time_) checkForSilence();
  }
}

void CapturePipeline::handleMessage(GstMessage* message) {
  switch (GST_MESSAGE_TYPE(message)) {
    case GST_MESSAGE_ERROR:
      consumers_.fail(errorFrom(message));
      break;
    case GST_MESSAGE_EOS:
      consumers_.fail(
          {CaptureError::kDomain, kStreamEnded, source_.videoDevice.value_or("") + ": the stream has ended"});
      break;
    case GST_MESSAGE_SEGMENT_DONE:
      loopFile(false);
      break;
    default:
      break;
  }
}

void CapturePipeline::checkForSilence() {
  if (video_sink_ && silence_.videoSilent()) {
    consumers_.fail({CaptureError::kDomain, kDeviceSilent, source_.name() + ": no picture for 2 s"});
  } else if (audio_sink_ && !source_.oneDevice() && silence_.audioSilent()) {
    consumers_.fail({CaptureError::kDomain, kAudioSilent, *source_.audioDevice + ": no sound for 2 s"});
  }
}

void CapturePipeline::loopFile(bool flush) {
  const auto flags = static_cast<GstSeekFlags>(GST_SEEK_FLAG_SEGMENT | (flush ? GST_SEEK_FLAG_FLUSH : 0));
  const auto seek = [&](GstElement* sink) {
    gst_element_seek(sink, 1.0, GST_FORMAT_TIME, flags, GST_SEEK_TYPE_SET, 0, GST_SEEK_TYPE_NONE, 0);
  };
  if (video_.kind == DeviceKind::file) seek(video_sink_.get());
  if (audio_.kind == DeviceKind::file && !source_.oneDevice()) seek(audio_sink_.get());
}

}  // namespace lmx
