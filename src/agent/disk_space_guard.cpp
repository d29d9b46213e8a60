// The watch over the free space of the volume that movies are written to.
#include <cerrno>
#include <filesystem>
#include <system_error>

#include "agent/agent_main.h"
#include "capture/api/capture_framework.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "record/disk_space.h"

namespace lmx {
namespace {

/// Free megabytes, or the errno.
struct Measure {
  std::uint64_t megabytes = 0;
  int error = 0;
};

Measure measure(const std::string& volume) {
  const VolumeSpace space = measureVolume(volume);
  return {space.freeKilobytes >> 10, space.error};
}

void removeIfEmpty(const std::string& directory) {
  std::error_code error;
  if (std::filesystem::is_empty(directory, error) && !error) std::filesystem::remove(directory, error);
}

/// Has the controller delete segments, the oldest first, until there is enough or nothing more is gained.
Measure freeSpace(LMRCaptureController* controller, const std::string& volume, Measure now,
                  std::uint64_t wanted) {
  while (now.megabytes < wanted) {
    if (const auto deleted = controller != nullptr ? controller->deleteEarliestSegment() : std::nullopt)
      removeIfEmpty(directoryOf(*deleted));
    const Measure next = measure(volume);
    if (next.error != 0 || next.megabytes == now.megabytes) break;
    now = next;
  }
  return now;
}

}  // namespace

void AgentMain::checkDiskSpace() {
  const auto record = session();
  if (!record) return;
  std::string volume = volumePath(*record);
  Measure space = measure(volume);
  if (space.error == ENOENT) {
    cancelCapture();
    if (setupRecordingRepository()) {
      volume = context_->recording.recording_repository_path.get().value_or("");
      space = measure(volume);
    }
  }
  if (space.error != 0) {
    stopCapture();
    context_->state.running.set(false);
    return;
  }
  const std::uint32_t wanted = record->diskSpaceCutoffInMB.get();
  const auto controller = captureController();
  space = freeSpace(controller.get(), volume, space, wanted);
  if (space.megabytes >= wanted) {
    recordAgainWithSpace(space.megabytes);
  } else {
    stopForLackOfSpace(space.megabytes, wanted);
  }
}

void AgentMain::recordAgainWithSpace(std::uint64_t megabytes) {
  const auto continuous = context_->recording.continuous.get();
  if (!continuous || !continuous->enabled) return;
  const auto controller = captureController();
  if (controller && !controller->hasShutDown()) return;
  shouldDisplayNoDiskSpaceMessage_ = true;
  LMPLogMessage(nullptr, kLogNotice, "%llu MB is sufficient, starting recorder",
                static_cast<unsigned long long>(megabytes));
  session()->stop_times.clearPassedDeadlines();
  prepareCapture();
}

void AgentMain::stopForLackOfSpace(std::uint64_t megabytes, std::uint32_t wanted) {
  if (shouldDisplayNoDiskSpaceMessage_) {
    LMPLogMessage(nullptr, kLogWarning,
                  "%llu MB is below threshold %u MB, unable to free space, recording disabled",
                  static_cast<unsigned long long>(megabytes), wanted);
    shouldDisplayNoDiskSpaceMessage_ = false;
  }
  const auto controller = captureController();
  const auto capture = controller ? controller->session() : nullptr;
  if (capture && capture->isRunning()) stopCapture();
}

}  // namespace lmx
