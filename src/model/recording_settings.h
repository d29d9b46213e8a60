// What the preferences set in the recording session; the rest of the session lies in record/.
#pragma once
#include <atomic>
#include <cstdint>

namespace lmx {

/// Thread-safe.
class RecordingSettings {
 public:
  [[nodiscard]] std::int32_t recordingType() const { return recordingType_; }
  void setRecordingType(std::int32_t v) { recordingType_ = v; }
  /// Minimum free space on the movie's volume for a start, megabytes.
  [[nodiscard]] std::uint32_t diskSpaceCutoffInMB() const { return diskSpaceCutoffInMB_; }
  void setDiskSpaceCutoffInMB(std::uint32_t v) { diskSpaceCutoffInMB_ = v; }

 protected:
  ~RecordingSettings() = default;

 private:
  std::atomic<std::int32_t> recordingType_{0};
  std::atomic<std::uint32_t> diskSpaceCutoffInMB_{0};
};

}  // namespace lmx
