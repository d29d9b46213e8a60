// The capture framework's factory.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"

namespace lmx {

/// The framework on GStreamer.
std::shared_ptr<CaptureFramework> newCaptureFramework();

}  // namespace lmx
