// The part of the recording session that the preferences set. record/ holds the rest of the session.
#pragma once
#include <cstdint>

#include "model/codes.h"
#include "support/shared_value.h"

namespace lmx {

/// Fields are thread-safe.
struct RecordingSettings {
  SharedValue<std::int32_t> recordingType{kRecordingTypeNone};
  SharedValue<std::uint32_t>
      diskSpaceCutoffInMB;  ///< free space needed on the movie's volume to start, megabytes

 protected:
  ~RecordingSettings() = default;
};

}  // namespace lmx
