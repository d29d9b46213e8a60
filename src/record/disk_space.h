// The volume that movies are written to.
#pragma once
#include <cstdint>
#include <string>

#include "record/agent_record.h"

namespace lmx {

/// One measurement of a volume.
struct VolumeSpace {
  std::uint64_t freeKilobytes = ~std::uint64_t{0};  ///< of 2^10 bytes; all ones when it could not be measured
  double totalMegabytes = 0;                        ///< of 2^20 bytes; 0 when it could not be measured
  int error = 0;                                    ///< the errno of a failed measurement
};
VolumeSpace measureVolume(const std::string& path);

/// The directory whose volume is measured: that of the session's file name, else the recording repository.
std::string volumePath(const AgentRecord& session);

/// @return 1 when the volume of the movie has `thresholdMB` or more, else 0 (logged).
int LXAgentRecordHasDiskSpace(std::uint32_t thresholdMB, const std::string& moviePath);

}  // namespace lmx
