// Settings of continuous recording, as read from the preferences and passed to the capture framework.
#pragma once
#include <cstdint>

namespace lmx {

struct LMRContinuousRecordingInfo {
  double cutoffPercentLeft = 0;     ///< old segments are deleted below this percentage of free space
  std::uint64_t segmentLength = 0;  ///< minutes
  bool upload = false;
  bool enabled = false;
  bool operator==(const LMRContinuousRecordingInfo&) const = default;
};

}  // namespace lmx
