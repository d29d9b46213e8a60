// Measures the space on a volume.
#include "record/disk_space.h"

#include <sys/vfs.h>

#include <cerrno>

#include "platform/log.h"
#include "platform/paths.h"
#include "record/engine_environment.h"

namespace lmx {

VolumeSpace measureVolume(const std::string& path) {
  VolumeSpace space;
  struct statfs volume {};
  if (statfs(path.c_str(), &volume) != 0) {
    space.error = errno;
    return space;
  }
  const auto blockSize = static_cast<std::uint64_t>(volume.f_bsize);
  space.freeKilobytes = (blockSize * static_cast<std::uint64_t>(volume.f_bavail)) >> 10;
  space.totalMegabytes =
      static_cast<double>(volume.f_blocks) * static_cast<double>(blockSize) / 1024.0 / 1024.0;
  return space;
}

std::string volumePath(const AgentRecord& session) {
  const auto file = session.filename.get();
  if (file && !file->empty()) return directoryOf(*file);
  const auto context = engineEnvironment().context;
  return context ? context->recording.recording_repository_path.get().value_or(std::string()) : std::string();
}

int LXAgentRecordHasDiskSpace(std::uint32_t thresholdMB, const std::string& moviePath) {
  const std::uint64_t freeMB = measureVolume(directoryOf(moviePath)).freeKilobytes >> 10;
  if (freeMB >= thresholdMB) return 1;
  LMPLogMessage(nullptr, kLogWarning, "%.0f MB is below threshold %d MB", static_cast<double>(freeMB),
                static_cast<int>(thresholdMB));
  return 0;
}

}  // namespace lmx
