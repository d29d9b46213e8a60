// Opens the camera for a look at it.
#pragma once
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "record/preview_controller.h"

namespace lmx {

/// A controller that has the camera open, or null (logged).
std::shared_ptr<MyLMRPreviewController> LXAgentRecordCreatePreviewController(
    const std::optional<std::string>& videoDevice, const std::optional<std::string>& audioDevice,
    bool addAudio, std::int64_t intervalMilliseconds, std::shared_ptr<CaptureSession> session);

}  // namespace lmx
