// Continuous recording as the preferences describe it and the capture framework takes it.
#pragma once
#include <cstdint>

namespace lmx {

struct LMRContinuousRecordingInfo {
  double cutoffPercentLeft = 0;     ///< free space in percent below which old segments go
  std::uint64_t segmentLength = 0;  ///< minutes
  bool upload = false;
  bool enabled = false;
  bool operator==(const LMRContinuousRecordingInfo&) const = default;
};

}  // namespace lmx
