// Keeps packets that GStreamer's depayloaders do not survive from them.
#pragma once
#include <gst/gst.h>

namespace lmx {

/// From now on the depayloaders that `decoder`, a decodebin or uridecodebin, makes for itself are given only
/// packets that do them no harm. What a network camera sends must not end the process. Call it before
/// anything flows.
void guardDepayloadersIn(GstElement* decoder);

}  // namespace lmx
