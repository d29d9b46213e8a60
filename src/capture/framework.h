// The capture framework's factory.
#pragma once
#include <memory>

#include "capture/api/capture_framework.h"

namespace lmx {

/// The framework on GStreamer. Cheap to make: plug-ins are loaded by warmUp or by the first use.
std::shared_ptr<CaptureFramework> newCaptureFramework();

}  // namespace lmx
