// What the preferences set in the recording session; the rest of the session lies in record/.
#pragma once
#include <cstdint>

#include "model/codes.h"
#include "support/shared_value.h"

namespace lmx {

/// Fields are thread-safe.
struct RecordingSettings {
  SharedValue<std::int32_t> recordingType{kRecordingTypeNone};
  SharedValue<std::uint32_t>
      diskSpaceCutoffInMB;  ///< free space on the movie's volume that a start needs, megabytes

 protected:
  ~RecordingSettings() = default;
};

}  // namespace lmx
