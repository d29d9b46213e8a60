// Connections to PipeWire.
#pragma once
#include <gst/gst.h>

#include "support/unique_fd.h"

namespace lmx {

/// Connects to PipeWire's socket, which is found as its library finds it. Does not block.
/// @return nothing valid without PipeWire
UniqueFd connectToPipeWire();

/// Gives a pipewiresrc that is not yet open a connection of its own; other elements are left alone, and
/// without PipeWire nothing happens: opening it then tells why. By default all its elements share one with
/// the plug-in's device provider. Devices that are listed while one of them is open leave listeners in it
/// that point to freed devices, and closing the last element then ends the process.
void connectApart(GstElement* source);

}  // namespace lmx
