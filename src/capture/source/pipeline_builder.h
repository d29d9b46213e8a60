// Builds the GStreamer pipeline of a capture source.
#pragma once
#include "capture/api/capture_framework.h"
#include "capture/gst/gst_handles.h"
#include "capture/source/capture_source.h"
#include "support/result.h"

namespace lmx {

/// A pipeline that is not started. Frames arrive at its appsink "vsink", samples at "asink"; a medium without
/// a device has no sink. Its clock is the system's monotonic one.
/// @return kDeviceNotFound or kDeviceFailed when a device is missing or can't be set up
Result<GstHandle<GstElement>, CaptureError> buildCapturePipeline(const CaptureSource& source);

}  // namespace lmx
