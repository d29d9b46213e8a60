// Opening and closing the camera of a preview.
#include "capture/preview_controller.h"

#include "capture/source/devices.h"
#include "platform/log.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kPatience = 12s;  // the source itself gives up after ten

/// Listing the hardware takes a while, and other devices have no name there.
std::string nameOf(const std::string& device) {
  const bool isHardware = parseDeviceID(device).kind == DeviceKind::hardware;
  const auto hardware = isHardware ? findHardware(device) : std::nullopt;
  return hardware ? hardware->name : device;
}

}  // namespace

Result<SourceLease, CaptureError> PreviewController::lease(const std::string& camera) {
  if (parseDeviceID(camera).kind == DeviceKind::unknown) {
    return CaptureError{
        CaptureError::kDomain, kDeviceNotFound,
        "\"" + camera + "\" is no camera identifier; list them with lmxagentd -i zq-device-list"};
  }
  return Sources::instance().lease({.device = camera, .picture = true, .demand = demandHere()});
}

bool PreviewController::attachIOWithDevice(const std::string& device, CaptureError* error) {
  const SourceLease ahead = std::move(ahead_);
  const auto camera = ahead && ahead->wish().device == device ? ahead : lease(device);
  // A picture is the only proof.
  const auto problem = camera ? (*camera)->waitUntilRunning(kPatience) : std::optional(camera.error());
  if (problem) {
    *error = *problem;
    return false;
  }
  const std::lock_guard lock(mutex_);
  camera_ = device;
  name_ = nameOf(device);
  return true;
}

/// Nothing is heard of a preview yet; its pictures need no microphone.
void PreviewController::addAudioDeviceWithID(const std::optional<std::string>& /*device*/) {}

std::string PreviewController::videoDeviceLocalizedDisplayName() const {
  const std::lock_guard lock(mutex_);
  return name_;
}

std::shared_ptr<CaptureSession> PreviewController::session() const {
  const std::lock_guard lock(mutex_);
  return lease_;
}

void PreviewController::startPreview() {
  std::string camera;
  {
    const std::lock_guard lock(mutex_);
    if (lease_ && !lease_->consumers().failure()) return;
    camera = camera_;
  }
  auto opened = lease(camera);
  auto problem = opened ? (*opened)->waitUntilRunning(kPatience) : std::optional(opened.error());
  if (problem) {
    LMPLogMessage(nullptr, kLogError, "The preview could not be started: %s", problem->message.c_str());
    return;
  }
  SourceLease before;  // one that was lost; given back without the lock
  const std::lock_guard lock(mutex_);
  before.swap(lease_);
  lease_ = *std::move(opened);
}

void PreviewController::stopPreview() {
  SourceLease lease;  // given back without the lock: a driver may take its time
  const std::lock_guard lock(mutex_);
  lease.swap(lease_);
}

bool PreviewController::isPreviewRunning() const {
  const std::lock_guard lock(mutex_);
  return lease_ != nullptr;
}

}  // namespace lmx
