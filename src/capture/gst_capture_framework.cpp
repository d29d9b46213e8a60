// Devices, compressions, controllers and the recovery of unfinished captures.
#include "capture/gst_capture_framework.h"

#include <dirent.h>
#include <unistd.h>

#include <iterator>

#include "capture/capture_controller.h"
#include "capture/gst/gst_handles.h"
#include "capture/preview_controller.h"
#include "capture/source/device_id.h"
#include "capture/source/device_list.h"
#include "capture/source/devices.h"
#include "capture/store/abandoned_capture.h"
#include "capture/store/capture_files.h"
#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {
namespace {

std::vector<std::string> subfolders(const std::string& folder) {
  std::vector<std::string> names;
  DIR* directory = opendir(folder.c_str());
  if (directory == nullptr) return names;
  while (const dirent* entry = readdir(directory)) {
    if (entry->d_name[0] != '.') names.push_back(folder + "/" + entry->d_name);
  }
  closedir(directory);
  return names;
}

std::optional<std::string> identifierOfFirst(bool video) {
  const auto devices = listHardware();
  const HardwareDevice* device = firstDevice(devices, video);
  return device == nullptr ? std::nullopt : std::optional(device->uniqueID);
}

/// Uses an element once, so that a recording need not wait until its library is loaded.
void loadPlugin(const char* name) {
  const GstHandle<GstElementFactory> factory(gst_element_factory_find(name));
  if (!factory) {
    LMPLogMessage(nullptr, kLogError,
                  "The GStreamer element %s is missing: recordings will fail; install its package", name);
    return;
  }
  const GstHandle<GstElement> element(gst_element_factory_create(factory.get(), nullptr));
  if (!element) return;
  gst_object_ref_sink(element.get());
  gst_element_set_state(element.get(), GST_STATE_READY);
  gst_element_set_state(element.get(), GST_STATE_NULL);
}

}  // namespace

// ---- devices and compressions

std::optional<std::string> GstCaptureFramework::defaultVideoDevice() { return identifierOfFirst(true); }

bool GstCaptureFramework::hasDevice(const std::string& uniqueID) {
  const DeviceID id = parseDeviceID(uniqueID);
  switch (id.kind) {
    case DeviceKind::test:
    case DeviceKind::network:
      return true;
    case DeviceKind::file:
      return access(id.name.c_str(), R_OK) == 0;
    case DeviceKind::hardware:
      return isHardwareThere(uniqueID);
    case DeviceKind::unknown:
      break;
  }
  return false;
}

CaptureCatalog::PreferredAudio GstCaptureFramework::preferredAudioDevice(const std::string& videoDevice) {
  const DeviceID id = parseDeviceID(videoDevice);
  if (id.kind == DeviceKind::test) {
    return {id.asFastAsPossible() ? "test://audio?speed=max" : "test://audio", false};
  }
  if (id.kind == DeviceKind::file || id.kind == DeviceKind::network) return {videoDevice, true};
  return microphoneFor(listHardware(), videoDevice);
}

bool GstCaptureFramework::audioDeviceUsable(const std::optional<std::string>& audioDevice) {
  return audioDevice ? hasDevice(*audioDevice) : identifierOfFirst(false).has_value();
}

std::optional<LMRCompressionOptions> GstCaptureFramework::compressionOptions(MediaType media,
                                                                             RecordingQuality quality) {
  return LMRCompressionOptions{.media = media, .quality = quality};
}

std::string GstCaptureFramework::deviceInformation() { return deviceListText(listHardware(), demandHere()); }

// ---- controllers

std::shared_ptr<LMRCaptureController> GstCaptureFramework::newCaptureController() {
  return std::make_shared<CaptureController>([] { return identifierOfFirst(false); });
}

std::unique_ptr<LMRPreviewController> GstCaptureFramework::newPreviewController(
    std::shared_ptr<CaptureSession> session) {
  return std::make_unique<PreviewController>(std::move(session));
}

// ---- start of the agent

void GstCaptureFramework::warmUp() {
  ensureGStreamer();
  for (const char* name : {"x264enc", "avenc_aac", "appsrc", "appsink", "videoconvert", "videoscale",
                           "videorate", "audioconvert", "audioresample", "decodebin"}) {
    loadPlugin(name);
  }
}

std::vector<RecoveredRecording> GstCaptureFramework::recoverUnfinished(
    const std::string& repository, const std::function<bool(const std::string& request)>& known) {
  std::vector<RecoveredRecording> all;
  for (const std::string& folder : subfolders(captureFolderOf(repository))) {
    const std::shared_ptr<FinishedCapture> capture = openAbandonedCapture(folder);
    if (!capture) continue;  // still being recorded by another process, or nothing of ours
    auto recordings = capture->recoverPending(repository, known);
    std::move(recordings.begin(), recordings.end(), std::back_inserter(all));
  }
  return all;
}

}  // namespace lmx
