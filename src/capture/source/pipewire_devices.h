// Lists the nodes of PipeWire.
#pragma once
#include <chrono>
#include <vector>

#include "capture/source/pipewire_node.h"

namespace lmx {

/// GStreamer's plug-in for PipeWire lists devices, too, but crashes when one comes and goes within a few
/// milliseconds, as each program's may. So the server is asked directly, by a connection for each listing.
///
/// Not thread-safe.
class PipeWireDevices {
 public:
  /// How long a server may take for the whole answer. It needs a few milliseconds; one that hangs holds up
  /// whatever needs the list.
  static constexpr std::chrono::milliseconds kPatience{2000};

  /// All nodes there are now; cameras and microphones with their formats. None without a server and from one
  /// that does not answer, which the log tells once until it answers again. Blocks for `kPatience` at most.
  std::vector<PipeWireNode> list();

 private:
  bool silent_ = false;
};

}  // namespace lmx
