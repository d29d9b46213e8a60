// Opening and closing the camera of a preview.
#include "capture/preview_controller.h"

#include "capture/source/devices.h"
#include "platform/log.h"

namespace lmx {

bool PreviewController::attachIOWithDevice(const std::string& device, CaptureError* error) {
  CaptureSource source;
  source.videoDevice = device;
  const auto lease = PipelineRegistry::instance().acquire(source);
  if (!lease) {
    *error = lease.error();
    return false;
  }
  // Listing the hardware takes a while, and other devices have no name there.
  const bool isHardware = parseDeviceID(device).kind == DeviceKind::hardware;
  const auto hardware = isHardware ? findHardware(device) : std::nullopt;
  const std::lock_guard lock(mutex_);
  source_ = source;
  name_ = hardware ? hardware->name : device;
  return true;
}

void PreviewController::addAudioDeviceWithID(const std::optional<std::string>& device) {
  const std::lock_guard lock(mutex_);
  source_.audioDevice = device;
}

std::string PreviewController::videoDeviceLocalizedDisplayName() const {
  const std::lock_guard lock(mutex_);
  return name_;
}

std::shared_ptr<CaptureSession> PreviewController::session() const {
  const std::lock_guard lock(mutex_);
  if (lease_) return lease_;
  return session_;
}

void PreviewController::startPreview() {
  const std::lock_guard lock(mutex_);
  if (lease_) return;
  auto lease = PipelineRegistry::instance().acquire(source_);
  if (lease) {
    lease_ = *std::move(lease);
  } else {
    LMPLogMessage(nullptr, kLogError, "The preview could not be started: %s", lease.error().message.c_str());
  }
}

void PreviewController::stopPreview() {
  const std::lock_guard lock(mutex_);
  lease_ = nullptr;
}

bool PreviewController::isPreviewRunning() const {
  const std::lock_guard lock(mutex_);
  return lease_ != nullptr;
}

}  // namespace lmx
