// The elements that a device's pipeline is built of.
#pragma once
#include <string>

#include "capture/gst/gst_handles.h"
#include "capture/source/device_id.h"

namespace lmx {

/// What follows a decoded picture or sound: an appsink named "vsink" or "asink". A bin with one sink pad;
/// null, with a log line, when an element is missing. Pictures pass as they were decoded, but for interlaced
/// ones.
GstHandle<GstElement> branchFor(bool picture);

/// The launch line of a synthetic camera or microphone, with its appsink.
std::string syntheticDevice(const DeviceID& device, bool picture, FrameRate rate);

/// Decodes whatever stands under the device's address; pads come and go. Null when the element is missing.
GstHandle<GstElement> uriDecoder(const DeviceID& device);

/// A hardware decoder's memory can't be read everywhere; what is here decodes in software.
void decodeInSoftware(GstElement* decoder);

/// A microphone of ALSA's own configuration, which no list shows. Null when the element is missing.
GstHandle<GstElement> alsaSource(const std::string& pcm);

/// Sets what the device's source element offers for low latency and true times: no clock of its own, no
/// correction of times by leaping, no buffers that the device waits for.
/// @param overUdp  what an RTSP camera is asked for; else its own connection, in which nothing gets lost
void tuneSource(GstElement* source, bool overUdp);

}  // namespace lmx
