// What PipeWire tells about a node, and what of it matters here. Pure.
#pragma once
#include <map>
#include <string>

#include "capture/gst/gst_handles.h"

namespace lmx {

/// A node of PipeWire's: a device, a program's output, or anything else.
struct PipeWireNode {
  std::map<std::string, std::string> properties;
  unsigned inputs = 0;   ///< ports it may have; none where the node had gone before it was asked
  unsigned outputs = 0;  ///< the same
  CapsHandle caps;       ///< what it can give; null when it doesn't tell, and where nobody asked
};

/// Whether it either gives or takes: nothing else can be recorded from, or seen to be away.
bool goesOneWay(const PipeWireNode& node);

/// Whether it is a camera, or a microphone when not `video`: its class is "Video/Source", "Audio/Source" or
/// one of their kinds, as "Video/Source/Virtual".
bool isCapture(const PipeWireNode& node, bool video);

/// A name for people.
std::string nameOf(const PipeWireNode& node);

/// What a pipewiresrc calls it: its serial number, which other than its name is never another node's. Its
/// name where the server gives none; empty without either.
std::string targetOf(const PipeWireNode& node);

/// GStreamer's provider that would list the same devices once more, as the server drives such hardware
/// itself; empty when there is none.
std::string providerReplacedBy(const PipeWireNode& node);

}  // namespace lmx
