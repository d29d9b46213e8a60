// From the launch line to a pipeline with devices and clock.
#include "capture/source/pipeline_builder.h"

#include "capture/source/devices.h"
#include "capture/source/pipeline_description.h"
#include "capture/source/test_source.h"

namespace lmx {
namespace {

CaptureError notFound(const std::string& problem) {
  return {CaptureError::kDomain, kDeviceNotFound, problem};
}

std::string unknownIdentifier(const DeviceID& device, const char* what) {
  return "\"" + device.text + "\" is no " + what + " identifier; list them with lmxagentd -i zq-device-list";
}

/// The launch line of all devices that need no hardware.
std::string describe(const CaptureSource& source) {
  std::string description;
  if (source.videoDevice) description += videoBranch(source.video(), source.frameRate);
  if (source.audioDevice) {
    description += " " + audioBranch(source.audio(), source.sampleRate, source.channels, source.oneDevice());
  }
  return description;
}

Result<GstHandle<GstElement>, CaptureError> launch(const CaptureSource& source) {
  ensureGStreamer();
  if (source.audioDevice && source.audio().kind == DeviceKind::unknown)
    return notFound(unknownIdentifier(source.audio(), "microphone"));
  if (source.videoDevice && source.video().kind == DeviceKind::unknown)
    return notFound(unknownIdentifier(source.video(), "camera"));
  const std::string description = describe(source);
  if (description.find_first_not_of(' ') == std::string::npos) {
    return GstHandle<GstElement>(GST_ELEMENT(gst_object_ref_sink(gst_pipeline_new(nullptr))));
  }
  auto pipeline = newPipeline(description);
  if (!pipeline) return notFound(pipeline.error().message);
  return *std::move(pipeline);
}

/// Takes ownership of a new element; null stays null.
GstHandle<GstElement> owned(GstElement* element) {
  if (element != nullptr) gst_object_ref_sink(element);
  return GstHandle<GstElement>(element);
}

/// Puts a real device and the branch behind it into the pipeline. @return why it could not be done
std::optional<CaptureError> addDevice(GstElement* pipeline, const DeviceID& id, const std::string& branch,
                                      const char* what) {
  const std::string named = std::string(what) + " \"" + id.text + "\"";
  const auto device = findHardware(id.text);
  if (!device) return notFound(named + " is not there");
  const auto source = owned(gst_device_create_element(device->device.get(), nullptr));
  GError* raw = nullptr;
  const auto rest = owned(gst_parse_bin_from_description(branch.c_str(), TRUE, &raw));
  const ErrorHandle parseError(raw);
  if (!source || !rest) return CaptureError{CaptureError::kDomain, kDeviceFailed, named + " can't be set up"};
  gst_bin_add_many(GST_BIN(pipeline), source.get(), rest.get(), nullptr);
  if (gst_element_link(source.get(), rest.get()) != FALSE) return std::nullopt;
  return CaptureError{CaptureError::kDomain, kDeviceFailed, named + " gives no format that can be recorded"};
}

std::optional<CaptureError> addHardware(GstElement* pipeline, const CaptureSource& source) {
  const DeviceID video = source.video();
  const DeviceID audio = source.audio();
  if (video.kind == DeviceKind::hardware) {
    auto error = addDevice(pipeline, video, deviceVideoBranch(source.frameRate), "camera");
    if (error) return error;
  }
  if (audio.kind != DeviceKind::hardware) return std::nullopt;
  return addDevice(pipeline, audio, deviceAudioBranch(source.sampleRate, source.channels), "microphone");
}

}  // namespace

Result<GstHandle<GstElement>, CaptureError> buildCapturePipeline(const CaptureSource& source) {
  auto pipeline = launch(source);
  if (!pipeline) return pipeline;
  GstElement* element = pipeline->get();
  if (auto error = addHardware(element, source)) return *std::move(error);
  // One monotonic clock for all: a microphone's own clock would distort the times of the picture.
  const GstHandle<GstClock> clock(gst_system_clock_obtain());
  gst_pipeline_use_clock(GST_PIPELINE(element), clock.get());
  if (source.video().kind == DeviceKind::test) attachTestPicture(element, source.video());
  if (source.audio().kind == DeviceKind::test) attachTestSound(element, source.audio());
  return pipeline;
}

}  // namespace lmx
