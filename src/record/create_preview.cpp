// Opens the camera for preview frames.
#include "record/create_preview.h"

#include "capture/api/capture_framework.h"
#include "platform/log.h"
#include "record/engine_environment.h"

namespace lmx {

std::shared_ptr<MyLMRPreviewController> LXAgentRecordCreatePreviewController(
    const std::optional<std::string>& videoDevice, const std::optional<std::string>& audioDevice,
    bool addAudio, std::int64_t intervalMilliseconds, std::shared_ptr<CaptureSession> session) {
  const auto framework = engineEnvironment().framework;
  if (!framework) return nullptr;
  auto preview =
      std::make_shared<MyLMRPreviewController>(framework->newPreviewController(std::move(session)));
  CaptureError error;
  if (!videoDevice || !preview->controller().attachIOWithDevice(*videoDevice, &error)) {
    if (!videoDevice) error = {CaptureError::kDomain, kDeviceNotFound, "no video device"};
    LMPLogMessage(nullptr, kLogNotice, "An error occurred while initializing the capture device: %s %d, %s",
                  error.domain.c_str(), error.code, error.message.c_str());
    return nullptr;
  }
  LMPLogMessage(nullptr, kLogDebug, "Using Video Device Named: %s",
                preview->controller().videoDeviceLocalizedDisplayName().c_str());
  if (addAudio) preview->controller().addAudioDeviceWithID(audioDevice);
  preview->setDelegate(std::make_shared<MyLMRPreviewControllerDelegate>(intervalMilliseconds));
  return preview;
}

}  // namespace lmx
