// Reads the session's status under its lock.
#include "record/recording_status.h"

#include <algorithm>
#include <limits>

#include "capture/api/capture_framework.h"
#include "model/codes.h"
#include "platform/log.h"
#include "record/disk_space.h"
#include "record/engine_environment.h"
#include "record/status_lock.h"

namespace lmx {
namespace {

RecorderStatus recorderStatusOf(int captureState) {
  if (captureState == kCaptureRecording) return kRecorderRecording;
  return captureState == kCapturePaused ? kRecorderPaused : kRecorderIdle;
}

}  // namespace

int LXAgentRecordGetStatus(const std::shared_ptr<AgentRecord>& session, RecordStatus* status) {
  if (!session) return invalidArguments("LXAgentRecordGetStatus");
  const StatusAndTimingLock lock(*session);
  if (!lock.locked()) return kRecordLockFailed;
  if (status == nullptr) return kRecordSuccess;
  const auto controller = session->captureController.get();
  const int state = controller ? controller->recordingState() : 0;
  status->recordStatus = recorderStatusOf(state);
  status->elapsedSeconds = controller ? controller->elapsedTimeInMilliseconds() / 1000 : 0;
  const auto seconds = [](const AgentRecord::Time& time, std::int32_t& out) {
    constexpr std::int64_t kMost =
        std::numeric_limits<std::int32_t>::max();  // a hard stop may lie beyond 2038
    if (time) out = static_cast<std::int32_t>(std::min<std::int64_t>(time->tv_sec, kMost));
  };
  seconds(session->launchTime.get(), status->start);
  seconds(session->stopTime.get(), status->stop);
  seconds(session->stop_times.hardStopTime.get(), status->hardStop);
  status->lastError = session->error.get();
  const VolumeSpace space = measureVolume(volumePath(*session));
  if (space.error != 0) LMPLogMessage(nullptr, kLogError, "statfs failed: %d", space.error);
  status->availableDiskMB = static_cast<double>(space.freeKilobytes >> 10);
  status->totalDiskMB = space.totalMegabytes;
  return kRecordSuccess;
}

}  // namespace lmx
