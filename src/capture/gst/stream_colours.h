// Corrects what containers and drivers say about the colours of encoded pictures.
#pragma once
#include <gst/gst.h>

namespace lmx {

/// From now on caps that pass through `pad` leave it to H.264 and H.265 streams to tell their colours, and
/// call those of JPEG full-range BT.601. Containers state no range, and Video4Linux states limited range for
/// JPEG; most decoders believe both rather than the stream. Call it before anything flows.
void correctColours(GstPad* pad);

/// The same for all that a decodebin or uridecodebin decodes.
void correctColoursIn(GstElement* decoder);

}  // namespace lmx
