// Opens the camera for preview frames.
#pragma once
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "record/preview_controller.h"

namespace lmx {

/// @return a controller that has opened the camera, or null (logged)
std::shared_ptr<MyLMRPreviewController> LXAgentRecordCreatePreviewController(
    const std::optional<std::string>& videoDevice, const std::optional<std::string>& audioDevice,
    bool addAudio, std::int64_t intervalMilliseconds, std::shared_ptr<CaptureSession> session);

}  // namespace lmx
