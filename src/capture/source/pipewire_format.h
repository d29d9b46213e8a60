// PipeWire's descriptions of formats as GStreamer's. Pure.
#pragma once
#include "capture/gst/gst_handles.h"

struct spa_pod;

namespace lmx {

/// What a node says that it can give, with what a choice of mode needs: sizes, rates, the format of raw
/// pictures, interlacing, channels. Each size has a structure of its own. Pictures that only a graphics card
/// can read carry the feature "memory:DMABuf".
/// @param format  of any program's making; its size must be that of the memory behind it
/// @return null for what can't be recorded and for what makes no sense
CapsHandle capsOfFormat(const spa_pod* format);

}  // namespace lmx
