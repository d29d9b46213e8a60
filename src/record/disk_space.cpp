// Measuring the volume that movies are written to.
#include <sys/vfs.h>

#include <cerrno>

#include "platform/log.h"
#include "platform/paths.h"
#include "record/engine.h"

namespace lmx {

std::uint64_t LXAgentFreeKilobytesAtPath(const std::string& path, int* errorOut) {
  struct statfs volume {};
  if (statfs(path.c_str(), &volume) != 0) {
    if (errorOut != nullptr) *errorOut = errno;
    return ~std::uint64_t{0};
  }
  const auto available = static_cast<std::uint64_t>(static_cast<double>(volume.f_bavail));
  return (static_cast<std::uint64_t>(volume.f_bsize) * available) >> 10;
}

int LXAgentRecordHasDiskSpace(std::uint32_t thresholdMB, const std::string& moviePath) {
  const std::uint64_t freeMB = LXAgentFreeKilobytesAtPath(directoryOf(moviePath), nullptr) >> 10;
  if (freeMB >= thresholdMB) return 1;
  LMPLogMessage(nullptr, kLogWarning, "%.0f MB is below threshold %d MB", static_cast<double>(freeMB),
                static_cast<int>(thresholdMB));
  return 0;
}

std::uint64_t LXAgentRecordAvailableDiskKilobytes(const std::shared_ptr<AgentRecord>& session) {
  return LXAgentFreeKilobytesAtPath(session ? session->volumePath() : std::string("."), nullptr);
}

std::uint64_t LXAgentRecordAvailableDiskMegabytes(const std::shared_ptr<AgentRecord>& session) {
  return LXAgentRecordAvailableDiskKilobytes(session) >> 10;
}

double LXAgentRecordTotalDiskMegabytes(const std::shared_ptr<AgentRecord>& session) {
  return session ? session->totalDiskSpaceInMB() : 0;
}

std::string AgentRecord::volumePath() {
  const auto file = filename();
  if (file && !file->empty()) return directoryOf(*file);
  const auto context = engineEnvironment().context;
  return context ? context->recording_repository_path().value_or(std::string()) : std::string();
}

double AgentRecord::totalDiskSpaceInMB() {
  struct statfs volume {};
  if (statfs(volumePath().c_str(), &volume) != 0) {
    LMPLogMessage(nullptr, kLogError, "statfs failed: %d", errno);
    return 0;
  }
  return static_cast<double>(volume.f_blocks) * static_cast<double>(volume.f_bsize) / 1024.0 / 1024.0;
}

}  // namespace lmx
