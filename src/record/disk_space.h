// Free space on the volume that movies are written to.
#pragma once
#include <cstdint>
#include <string>

#include "record/agent_record.h"

namespace lmx {

/// One measurement of a volume.
struct VolumeSpace {
  std::uint64_t freeKilobytes = ~std::uint64_t{0};  ///< of 2^10 bytes; all ones if the measurement failed
  double totalMegabytes = 0;                        ///< of 2^20 bytes; 0 if the measurement failed
  int error = 0;                                    ///< errno of a failed measurement
};
VolumeSpace measureVolume(const std::string& path);

/// The directory whose volume is measured: that of the session's file name, or else the recording repository.
std::string volumePath(const AgentRecord& session);

/// @return 1 when the movie's volume has at least `thresholdMB` free, else 0 (logged)
int LXAgentRecordHasDiskSpace(std::uint32_t thresholdMB, const std::string& moviePath);

}  // namespace lmx
