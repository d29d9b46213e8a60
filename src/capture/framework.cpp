// The factory of the capture framework.
#include "capture/framework.h"

#include "capture/gst_capture_framework.h"

namespace lmx {

std::shared_ptr<CaptureFramework> newCaptureFramework() { return std::make_shared<GstCaptureFramework>(); }

}  // namespace lmx
