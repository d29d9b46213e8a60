// The synthetic camera and microphone: what is drawn into their frames, and the faults they can simulate.
#pragma once
#include <gst/gst.h>

#include "capture/source/device_id.h"

namespace lmx {

/// Draws the frame number and the clock into each frame of the pipeline's "vsource" and simulates the faults
/// that its options ask for: "lost-after", "silent-after" and "eos-after" (seconds of running time).
void attachTestPicture(GstElement* pipeline, const DeviceID& id);
/// The same faults for "asource".
void attachTestSound(GstElement* pipeline, const DeviceID& id);

}  // namespace lmx
