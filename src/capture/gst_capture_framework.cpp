// Devices, compressions, controllers and the recovery of unfinished captures.
#include "capture/gst_capture_framework.h"

#include <dirent.h>
#include <malloc.h>
#include <unistd.h>

#include <iterator>

#include "capture/capture_controller.h"
#include "capture/gst/plugin_packages.h"
#include "capture/gst/video_encoders.h"
#include "capture/preview_controller.h"
#include "capture/source/device_id.h"
#include "capture/source/device_list.h"
#include "capture/source/devices.h"
#include "capture/source/sources.h"
#include "capture/store/abandoned_capture.h"
#include "capture/store/capture_files.h"
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
  const auto devices = Sources::instance().hardware();
  const HardwareDevice* device = firstDevice(devices, video);
  return device == nullptr ? std::nullopt : std::optional(device->uniqueID);
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
      return Sources::instance().delivers(uniqueID) || isHardwareThere(uniqueID);
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
  return microphoneFor(Sources::instance().hardware(), videoDevice);
}

bool GstCaptureFramework::canBeMicrophone(const std::string& audioDevice) {
  return parseDeviceID(audioDevice).canBeMicrophone();
}

bool GstCaptureFramework::hasMicrophone(const std::optional<std::string>& audioDevice) {
  if (!audioDevice) return identifierOfFirst(false).has_value();
  // A name of ALSA's configuration is in no list; whether it opens shows at the recording.
  return parseDeviceID(*audioDevice).alsaName() || hasDevice(*audioDevice);
}

std::optional<LMRCompressionOptions> GstCaptureFramework::compressionOptions(MediaType media,
                                                                             RecordingQuality quality) {
  return LMRCompressionOptions{.media = media, .quality = quality};
}

std::string GstCaptureFramework::deviceInformation(const PictureLimits& limits) {
  return deviceListText(listHardware(), demandHere(limits.size, limits.rate));
}

// ---- controllers

std::shared_ptr<LMRCaptureController> GstCaptureFramework::newCaptureController() {
  return std::make_shared<CaptureController>();
}

std::unique_ptr<LMRPreviewController> GstCaptureFramework::newPreviewController(
    std::shared_ptr<CaptureSession> session) {
  return std::make_unique<PreviewController>(session);
}

// ---- start of the agent

std::shared_ptr<CaptureSession> GstCaptureFramework::openAhead(const std::string& camera) {
  auto lease = PreviewController::lease(camera);
  return lease ? *std::move(lease) : nullptr;
}

void GstCaptureFramework::warmUp() {
  loadPlugins();
  VideoEncoderChoice::instance().tryOut(knownVideoEncoders());
  malloc_trim(0);  // what the encoders that were tried have freed
}

void GstCaptureFramework::waitUntilClosed(std::chrono::milliseconds limit) {
  Sources::instance().waitUntilClosed(limit);
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
