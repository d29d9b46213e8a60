// Monitors free space on the volume that movies are written to.
#pragma once
#include <cstdint>

#include "agent/capture_actions.h"
#include "model/agent_context.h"

namespace lmx {

/// Main thread only.
class DiskSpaceGuard {
 public:
  /// Both outlive the object.
  DiskSpaceGuard(AgentContext& context, CaptureActions& capture) : context_(context), capture_(capture) {}

  /// Stops recording when the movie's volume is nearly full. In continuous mode, starts recording again when
  /// there is enough space. Ends the agent when the volume can't be measured.
  void checkDiskSpace();

 private:
  void recordAgainWithSpace(std::uint64_t megabytes);
  void stopForLackOfSpace(std::uint64_t megabytes, std::uint32_t wanted);

  AgentContext& context_;
  CaptureActions& capture_;
  bool shouldDisplayNoDiskSpaceMessage_ = true;
};

}  // namespace lmx
