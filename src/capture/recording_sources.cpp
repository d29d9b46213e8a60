// Leases, and who gets what of them.
#include "capture/recording_sources.h"

#include "platform/log.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kCameraPatience = 12s;  // the source itself gives up after ten
constexpr auto kMicrophonePatience = 1500ms;

/// One device gives both where it is one stream.
bool givesBoth(const RecordingPlan& plan) {
  if (!plan.camera || plan.camera != plan.microphone) return false;
  const DeviceKind kind = parseDeviceID(*plan.camera).kind;
  return kind == DeviceKind::file || kind == DeviceKind::network;
}

const Source& leading(const SourceLease& camera, const SourceLease& microphone) {
  return camera ? *camera : *microphone;
}

}  // namespace

Result<RecordingSources, CaptureError> RecordingSources::open(const RecordingPlan& plan) {
  SourceLease camera;
  SourceLease microphone;
  if (plan.camera) {
    auto lease = Sources::instance().lease({.device = *plan.camera,
                                            .picture = true,
                                            .demand = demandHere(plan.demand.size, plan.demand.maximumRate)});
    if (!lease) return std::move(lease).error();
    camera = *std::move(lease);
  }
  if (givesBoth(plan)) {
    microphone = camera;
  } else if (plan.microphone) {
    auto lease = Sources::instance().lease({.device = *plan.microphone, .picture = false, .demand = {}});
    if (lease) {
      microphone = *std::move(lease);
    } else if (!camera) {
      return std::move(lease).error();
    } else {
      LMPLogMessage(nullptr, kLogError, "The recording has no sound: %s", lease.error().message.c_str());
    }
  }
  if (camera) {
    if (auto problem = camera->waitUntilRunning(kCameraPatience)) return *std::move(problem);
  }
  // Opened at the same time; one that comes later is heard from then on.
  if (microphone) (void)microphone->waitUntilRunning(kMicrophonePatience);
  return RecordingSources(std::move(camera), std::move(microphone));
}

RecordingSources::RecordingSources(SourceLease camera, SourceLease microphone)
    : camera_(std::move(camera)),
      microphone_(std::move(microphone)),
      clock_(leading(camera_, microphone_).clock()),
      format_(camera_ ? camera_->format() : CameraFormat{}) {}

void RecordingSources::add(const std::shared_ptr<CaptureConsumer>& consumer) const {
  if (camera_) camera_->consumers().add(consumer, {.picture = true, .sound = oneDevice()});
  if (microphone_ && !oneDevice()) microphone_->consumers().add(consumer, {.picture = false, .sound = true});
}

void RecordingSources::remove(const CaptureConsumer* consumer) const {
  for (const auto* source : {&camera_, &microphone_}) {
    if (*source) (*source)->consumers().remove(consumer);
  }
}

void RecordingSources::start() const {
  for (const auto* source : {&camera_, &microphone_}) {
    if (*source) (*source)->start();
  }
}

void RecordingSources::release() {
  microphone_ = nullptr;
  camera_ = nullptr;
}

std::shared_ptr<CaptureSession> RecordingSources::session() const {
  if (camera_) return camera_;
  return microphone_;
}

double RecordingSources::soundCorrection() const { return microphone_ ? microphone_->soundCorrection() : 0; }

}  // namespace lmx
