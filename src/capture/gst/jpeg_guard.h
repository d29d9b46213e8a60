// Keeps JPEG pictures that GStreamer's decoder does not survive from it.
#pragma once
#include <gst/gst.h>

namespace lmx {

/// From now on the JPEG decoders that are added anywhere within `bin` are given only pictures that do them no
/// harm: the damaged ones of a camera must not end the process. Call it before anything flows.
void guardJpegDecodersIn(GstElement* bin);

}  // namespace lmx
