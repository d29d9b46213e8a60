// Measures free space, deletes old segments, and stops or restarts the recording.
#include "agent/disk_space_guard.h"

#include <cerrno>
#include <filesystem>
#include <system_error>

#include "agent/recording_repository.h"
#include "capture/api/capture_framework.h"
#include "platform/log.h"
#include "platform/paths.h"
#include "record/disk_space.h"

namespace lmx {
namespace {

/// Free megabytes, or the errno of a failed measurement.
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

/// Has the controller delete the oldest segments until there is enough space or deleting gains nothing.
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

void DiskSpaceGuard::checkDiskSpace() {
  const auto record = context_.record_context();
  if (!record) return;
  std::string volume = volumePath(*record);
  Measure space = measure(volume);
  if (space.error == ENOENT) {
    capture_.cancelCapture();
    const std::string repository = context_.recording.recording_repository_path.get().value_or("");
    if (setupRecordingRepository(context_, repository)) {
      volume = repository;
      space = measure(volume);
    }
  }
  if (space.error != 0) {
    capture_.stopCapture();
    context_.state.running.set(false);
    return;
  }
  const std::uint32_t wanted = record->diskSpaceCutoffInMB.get();
  const auto controller = capture_.captureController();
  space = freeSpace(controller.get(), volume, space, wanted);
  if (space.megabytes >= wanted) {
    recordAgainWithSpace(space.megabytes);
  } else {
    stopForLackOfSpace(space.megabytes, wanted);
  }
}

void DiskSpaceGuard::recordAgainWithSpace(std::uint64_t megabytes) {
  if (!context_.recording.isContinuous()) return;
  const auto controller = capture_.captureController();
  if (controller && !controller->hasShutDown()) return;
  shouldDisplayNoDiskSpaceMessage_ = true;
  LMPLogMessage(nullptr, kLogNotice, "%llu MB is sufficient, starting recorder",
                static_cast<unsigned long long>(megabytes));
  context_.record_context()->stop_times.clearPassedDeadlines();
  capture_.prepareCapture();
}

void DiskSpaceGuard::stopForLackOfSpace(std::uint64_t megabytes, std::uint32_t wanted) {
  if (shouldDisplayNoDiskSpaceMessage_) {
    LMPLogMessage(nullptr, kLogWarning,
                  "%llu MB is below threshold %u MB, unable to free space, recording disabled",
                  static_cast<unsigned long long>(megabytes), wanted);
    shouldDisplayNoDiskSpaceMessage_ = false;
  }
  const auto controller = capture_.captureController();
  const auto capture = controller ? controller->session() : nullptr;
  if (capture && capture->isRunning()) capture_.stopCapture();
}

}  // namespace lmx
