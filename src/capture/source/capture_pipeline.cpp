// Opening, sharing, running and closing the capture devices.
#include "capture/source/capture_pipeline.h"

#include <gst/app/gstappsink.h>
#include <gst/video/video.h>

#include <algorithm>
#include <map>

#include "capture/source/devices.h"
#include "capture/source/pipeline_description.h"
#include "capture/source/test_source.h"
#include "platform/log.h"
#include "support/format.h"
#include "support/time_value.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr std::int64_t kSilenceLimitMs = 2000;

std::int64_t steadyMs() {
  return std::chrono::duration_cast<std::chrono::milliseconds>(
             std::chrono::steady_clock::now().time_since_epoch())
      .count();
}

/// The pipelines that are open. Opening and closing happen under one lock, so that a device that is just
/// being closed is never opened a second time.
struct Registry {
  struct Entry {
    std::shared_ptr<CapturePipeline> pipeline;
    int users = 0;
  };
  std::mutex mutex;
  std::map<std::string, Entry> open;  // guarded by mutex
};

Registry& registry() {
  static auto* instance = new Registry;  // threads that outlive main may still give leases back
  return *instance;
}

void giveBack(const std::string& key) {
  const std::lock_guard lock(registry().mutex);
  const auto found = registry().open.find(key);
  if (found == registry().open.end() || --found->second.users > 0) return;
  registry().open.erase(found);  // closes the devices
}

}  // namespace

std::string CaptureSource::key() const {
  return string_with_format("%s|%s|%d/%d|%d|%d", videoDevice.value_or("-").c_str(),
                            audioDevice.value_or("-").c_str(), frameRate.numerator, frameRate.denominator,
                            sampleRate, channels);
}

CapturePipeline::Lease CapturePipeline::acquire(const CaptureSource& source, CaptureError* error) {
  const std::string key = source.key();
  const std::lock_guard lock(registry().mutex);
  auto found = registry().open.find(key);
  if (found != registry().open.end()) {
    const std::lock_guard state(found->second.pipeline->consumers_mutex_);
    if (found->second.pipeline->failure_) {
      *error = *found->second.pipeline->failure_;
      return nullptr;
    }
  } else {
    std::shared_ptr<CapturePipeline> pipeline(new CapturePipeline(source));
    if (!pipeline->open(error)) return nullptr;
    found = registry().open.emplace(key, Registry::Entry{std::move(pipeline), 0}).first;
  }
  ++found->second.users;
  return lease(key, found->second.pipeline);
}

CapturePipeline::Lease CapturePipeline::lease(const std::string& key,
                                              const std::shared_ptr<CapturePipeline>& pipeline) {
  return Lease(pipeline.get(), [key](CapturePipeline*) { giveBack(key); });
}

CapturePipeline::CapturePipeline(const CaptureSource& source)
    : source_(source),
      video_(parseDeviceID(source.videoDevice.value_or(""))),
      audio_(parseDeviceID(source.audioDevice.value_or(""))) {
  real_time_ = !video_.asFastAsPossible() && !audio_.asFastAsPossible();
  if (video_.kind == DeviceKind::test) {
    width_ = pictureSize(video_).width;
    height_ = pictureSize(video_).height;
  }
}

CapturePipeline::~CapturePipeline() { close(); }

PictureSize CapturePipeline::size() const { return {width_, height_}; }

// ---- opening

std::string CapturePipeline::describe(std::string* problem) {
  std::string description;
  if (source_.videoDevice) {
    if (video_.kind == DeviceKind::unknown) {
      *problem =
          "\"" + video_.text + "\" is no camera identifier; list them with lmxagentd -i zq-device-list";
    }
    description += videoBranch(video_, source_.frameRate);
  }
  if (source_.audioDevice) {
    if (audio_.kind == DeviceKind::unknown) {
      *problem =
          "\"" + audio_.text + "\" is no microphone identifier; list them with lmxagentd -i zq-device-list";
    }
    const bool sameFile = source_.audioDevice == source_.videoDevice;
    description += " " + audioBranch(audio_, source_.sampleRate, source_.channels, sameFile);
  }
  return description;
}

bool CapturePipeline::open(CaptureError* error) {
  ensureGStreamer();
  std::string problem;
  const std::string description = describe(&problem);
  if (problem.empty()) {
    if (description.find_first_not_of(' ') == std::string::npos) {
      pipeline_.reset(gst_pipeline_new(nullptr));
      gst_object_ref_sink(pipeline_.get());
    } else {
      pipeline_ = newPipeline(description, &problem);
    }
  }
  if (!pipeline_ || !problem.empty()) {
    *error = {CaptureError::kDomain, kDeviceNotFound, problem};
    return false;
  }
  if (!addHardware(error)) return false;
  // One clock for all, and a monotonic one: a microphone's own clock would bend the picture's times.
  const GstHandle<GstClock> clock(gst_system_clock_obtain());
  gst_pipeline_use_clock(GST_PIPELINE(pipeline_.get()), clock.get());
  attachSinks();
  if (video_sink_ && video_.kind == DeviceKind::test) attachTestPicture(pipeline_.get(), video_);
  if (audio_sink_ && audio_.kind == DeviceKind::test) attachTestSound(pipeline_.get(), audio_);
  return settle(error);
}

namespace {

bool addDevice(GstElement* pipeline, const std::string& uniqueID, const std::string& branch, const char* what,
               CaptureError* error) {
  const auto device = findHardware(uniqueID);
  if (!device) {
    *error = {CaptureError::kDomain, kDeviceNotFound,
              std::string(what) + " \"" + uniqueID + "\" is not there"};
    return false;
  }
  GstElement* source = gst_device_create_element(device->device.get(), nullptr);
  GError* raw = nullptr;
  GstElement* rest = gst_parse_bin_from_description(branch.c_str(), TRUE, &raw);
  const ErrorHandle parseError(raw);
  if (source == nullptr || rest == nullptr) {
    *error = {CaptureError::kDomain, kDeviceFailed,
              std::string(what) + " \"" + uniqueID + "\" can't be set up"};
    return false;
  }
  gst_bin_add_many(GST_BIN(pipeline), source, rest, nullptr);
  if (gst_element_link(source, rest) == FALSE) {
    *error = {CaptureError::kDomain, kDeviceFailed,
              std::string(what) + " \"" + uniqueID + "\" gives no format that can be recorded"};
    return false;
  }
  return true;
}

}  // namespace

bool CapturePipeline::addHardware(CaptureError* error) {
  if (video_.kind == DeviceKind::hardware &&
      !addDevice(pipeline_.get(), video_.text, deviceVideoBranch(source_.frameRate), "camera", error)) {
    return false;
  }
  return audio_.kind != DeviceKind::hardware ||
         addDevice(pipeline_.get(), audio_.text, deviceAudioBranch(source_.sampleRate, source_.channels),
                   "microphone", error);
}

void CapturePipeline::attachSinks() {
  video_sink_ = elementNamed(pipeline_.get(), "vsink");
  audio_sink_ = elementNamed(pipeline_.get(), "asink");
  const auto attach = [this](GstElement* sink, GstFlowReturn (*newSample)(GstElement*, gpointer) noexcept) {
    if (sink == nullptr) return;
    GstAppSinkCallbacks callbacks{};
    callbacks.new_sample = reinterpret_cast<GstFlowReturn (*)(GstAppSink*, gpointer)>(newSample);
    gst_app_sink_set_callbacks(GST_APP_SINK(sink), &callbacks, this, nullptr);
  };
  attach(video_sink_.get(), &newVideoSample);
  attach(audio_sink_.get(), &newAudioSample);
}

bool CapturePipeline::settle(CaptureError* error) {
  GstBus* bus = gst_element_get_bus(pipeline_.get());
  const GstHandle<GstBus> busHandle(bus);
  GstStateChangeReturn result = gst_element_set_state(pipeline_.get(), GST_STATE_PAUSED);
  if (result == GST_STATE_CHANGE_ASYNC) {
    const auto deadline = std::chrono::steady_clock::now() + 5s;
    do {
      result = gst_element_get_state(pipeline_.get(), nullptr, nullptr, 20 * GST_MSECOND);
      if (gst_bus_have_pending(bus) == FALSE) continue;
      const MessageHandle message(gst_bus_pop_filtered(bus, GST_MESSAGE_ERROR));
      if (message) {
        *error = errorFrom(message.get());
        return false;
      }
    } while (result == GST_STATE_CHANGE_ASYNC && std::chrono::steady_clock::now() < deadline);
  }
  if (result == GST_STATE_CHANGE_FAILURE || result == GST_STATE_CHANGE_ASYNC) {
    const MessageHandle message(gst_bus_pop_filtered(bus, GST_MESSAGE_ERROR));
    *error = message ? errorFrom(message.get())
                     : CaptureError{CaptureError::kDomain, kDeviceSilent,
                                    "\"" + source_.videoDevice.value_or(source_.audioDevice.value_or("")) +
                                        "\" gave no picture within 5 s"};
    return false;
  }
  last_video_ms_ = last_audio_ms_ = steadyMs();
  opened_at_ = secondsSinceReferenceDate();
  if (video_.kind == DeviceKind::file || audio_.kind == DeviceKind::file) loopFile(true);
  if (real_time_) start();
  bus_thread_ = std::thread([this] { watchBus(); });
  return true;
}

void CapturePipeline::start() {
  if (running_.exchange(true)) return;
  last_video_ms_ = last_audio_ms_ = steadyMs();
  gst_element_set_state(pipeline_.get(), GST_STATE_PLAYING);
  // A file prerolls again after its seek: until then there is no base time, and running time means nothing.
  gst_element_get_state(pipeline_.get(), nullptr, nullptr, 2 * GST_SECOND);
}

void CapturePipeline::close() {
  ending_ = true;
  if (pipeline_) {
    const GstHandle<GstBus> bus(gst_element_get_bus(pipeline_.get()));
    gst_bus_post(bus.get(), gst_message_new_application(nullptr, gst_structure_new_empty("end")));
  }
  if (bus_thread_.joinable()) bus_thread_.join();
  if (pipeline_) gst_element_set_state(pipeline_.get(), GST_STATE_NULL);
  running_ = false;
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
  static_cast<CapturePipeline*>(self)->deliver(sink, true);
  return GST_FLOW_OK;
}

GstFlowReturn CapturePipeline::newAudioSample(GstElement* sink, gpointer self) noexcept {
  static_cast<CapturePipeline*>(self)->deliver(sink, false);
  return GST_FLOW_OK;
}

void CapturePipeline::deliver(GstElement* sink, bool video) {
  const SampleHandle sample(gst_app_sink_pull_sample(GST_APP_SINK(sink)));
  if (!sample) return;
  (video ? last_video_ms_ : last_audio_ms_) = steadyMs();
  GstBuffer* buffer = gst_sample_get_buffer(sample.get());
  const GstClockTime time = gst_segment_to_running_time(gst_sample_get_segment(sample.get()), GST_FORMAT_TIME,
                                                        GST_BUFFER_PTS(buffer));
  if (buffer == nullptr || !GST_CLOCK_TIME_IS_VALID(time)) return;
  if (video && width_ == 0) {
    GstVideoInfo info;
    if (gst_video_info_from_caps(&info, gst_sample_get_caps(sample.get())) != FALSE) {
      width_ = info.width;
      height_ = info.height;
    }
  }
  std::vector<std::shared_ptr<CaptureConsumer>> consumers;
  {
    const std::lock_guard lock(consumers_mutex_);
    for (const auto& weak : consumers_) {
      if (auto consumer = weak.lock()) consumers.push_back(std::move(consumer));
    }
  }
  for (const auto& consumer : consumers) {
    BufferHandle reference(gst_buffer_ref(buffer));
    const double seconds = static_cast<double>(time) / 1e9;
    video ? consumer->onVideo(std::move(reference), seconds)
          : consumer->onAudio(std::move(reference), seconds);
  }
}

void CapturePipeline::addConsumer(const std::shared_ptr<CaptureConsumer>& consumer) {
  const std::lock_guard lock(consumers_mutex_);
  consumers_.push_back(consumer);
}

void CapturePipeline::removeConsumer(const CaptureConsumer* consumer) {
  const std::lock_guard lock(consumers_mutex_);
  std::erase_if(consumers_, [&](const auto& weak) {
    const auto held = weak.lock();
    return !held || held.get() == consumer;
  });
}

// ---- trouble

CaptureError CapturePipeline::errorFrom(GstMessage* message) const {
  GError* raw = nullptr;
  gst_message_parse_error(message, &raw, nullptr);
  const ErrorHandle error(raw);
  int code = kDeviceFailed;
  if (error && error->domain == GST_RESOURCE_ERROR) {
    if (error->code == GST_RESOURCE_ERROR_NOT_FOUND) code = kDeviceNotFound;
    if (error->code == GST_RESOURCE_ERROR_BUSY) code = kDeviceBusy;
    if (error->code == GST_RESOURCE_ERROR_NOT_AUTHORIZED) code = kDeviceNotPermitted;
  }
  return {CaptureError::kDomain, code,
          source_.videoDevice.value_or(source_.audioDevice.value_or("")) + ": " +
              (error ? error->message : "failed")};
}

void CapturePipeline::report(const CaptureError& error) {
  std::vector<std::shared_ptr<CaptureConsumer>> consumers;
  {
    const std::lock_guard lock(consumers_mutex_);
    if (failure_) return;  // what follows the first error is its echo
    failure_ = error;
    for (const auto& weak : consumers_) {
      if (auto consumer = weak.lock()) consumers.push_back(std::move(consumer));
    }
  }
  LMPLogMessage(nullptr, kLogError, "Capture device lost: %s (code %d)", error.message.c_str(), error.code);
  for (const auto& consumer : consumers) consumer->onCaptureError(error);
}

void CapturePipeline::watchBus() {
  const GstHandle<GstBus> bus(gst_element_get_bus(pipeline_.get()));
  while (!ending_) {
    const MessageHandle message(gst_bus_timed_pop_filtered(
        bus.get(), 500 * GST_MSECOND,
        static_cast<GstMessageType>(GST_MESSAGE_ERROR | GST_MESSAGE_EOS | GST_MESSAGE_SEGMENT_DONE |
                                    GST_MESSAGE_APPLICATION)));
    if (ending_) return;
    if (message) handleMessage(message.get());
    if (running_ && real_time_) checkForSilence();
  }
}

void CapturePipeline::handleMessage(GstMessage* message) {
  switch (GST_MESSAGE_TYPE(message)) {
    case GST_MESSAGE_ERROR:
      report(errorFrom(message));
      break;
    case GST_MESSAGE_EOS:
      report(
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
  const std::int64_t now = steadyMs();
  if (video_sink_ && now - last_video_ms_ > kSilenceLimitMs) {
    report({CaptureError::kDomain, kDeviceSilent, *source_.videoDevice + ": no picture for 2 s"});
  } else if (audio_sink_ && source_.audioDevice != source_.videoDevice &&
             now - last_audio_ms_ > kSilenceLimitMs) {
    report({CaptureError::kDomain, kAudioSilent, *source_.audioDevice + ": no sound for 2 s"});
  }
}

void CapturePipeline::loopFile(bool flush) {
  const auto flags = static_cast<GstSeekFlags>(GST_SEEK_FLAG_SEGMENT | (flush ? GST_SEEK_FLAG_FLUSH : 0));
  const auto seek = [&](GstElement* sink) {
    gst_element_seek(sink, 1.0, GST_FORMAT_TIME, flags, GST_SEEK_TYPE_SET, 0, GST_SEEK_TYPE_NONE, 0);
  };
  if (video_.kind == DeviceKind::file) seek(video_sink_.get());
  if (audio_.kind == DeviceKind::file && source_.audioDevice != source_.videoDevice) seek(audio_sink_.get());
}

}  // namespace lmx
