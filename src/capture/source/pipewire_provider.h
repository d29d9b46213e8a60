// Keeps PipeWire's list of devices up to date, so that it need not be asked for.
#pragma once
#include <memory>
#include <optional>

#include "capture/gst/gst_handles.h"
#include "support/unique_fd.h"

namespace lmx {

/// GStreamer's plug-in for PipeWire crashes when it is asked for the devices while one of them changes, as at
/// each end of a recording: it answers by a connection that it has let go of already. A provider that has
/// been started answers from a list that it keeps. So it is started as soon as there is a server, and started
/// again with the next one when that has gone. Without a server it is not asked at all.
///
/// Of the process there must be one only. Not thread-safe.
class PipeWireProvider {
 public:
  /// To be called before each listing of devices, never while they are listed. GStreamer is initialised.
  void keepUp();

 private:
  [[nodiscard]] bool serverHasGone() const;

  std::optional<unsigned> rank_;  ///< that of the plug-in
  GstHandle<GstDeviceProvider> started_;
  UniqueFd server_;  ///< a connection that says nothing: it ends with the server
};

}  // namespace lmx
