// Which of GStreamer's plug-ins are asked for devices.
#pragma once
#include <set>
#include <string>

namespace lmx {

/// To be called before each listing of devices, never while they are listed. PipeWire's is never asked:
/// PipeWireDevices does. PulseAudio's keeps three files open of each attempt that fails: it is asked when
/// there is a server. GStreamer is initialised. Not thread-safe.
/// @param replaced  names of those whose devices PipeWire lists already
void chooseProviders(const std::set<std::string>& replaced);

}  // namespace lmx
